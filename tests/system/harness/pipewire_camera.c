// A camera in PipeWire: a node with YUY2 pictures of one size and rate, each with a number in the top row of cells (see
// movie.counters) and the time when it was taken. Arguments: NAME API WIDTH HEIGHT RATE PPM NUMBERS, where API is what
// drives the hardware, or empty, PPM says by how many parts in a million the camera is fast, and NUMBERS is "count" or
// "ms": the pictures are counted, or have the milliseconds of CLOCK_MONOTONIC when they were taken.
#include <spa/param/video/format-utils.h>
#include <string.h>

#include "pipewire_device.h"

enum { kCells = 32, kRows = 18 };

struct camera {
  struct device device;  // first: what happens is told with its address
  int width, height;
  int tells_time;
};

static void draw(const struct camera* camera, uint8_t* picture, uint32_t number) {
  const int stride = camera->width * 2;
  for (int y = 0; y < camera->height; ++y) {
    uint8_t* row = picture + y * stride;
    for (int x = 0; x < camera->width; ++x) {
      const uint32_t cell = (uint32_t)(x * kCells / camera->width);
      const int set = number >> (kCells - 1 - cell) & 1;
      row[2 * x] = y >= camera->height / kRows ? (uint8_t)(90 + (y + number) % 40) : set ? 235 : 16;
      row[2 * x + 1] = 128;
    }
  }
}

static void on_process(void* data) {
  struct camera* camera = data;
  struct pw_buffer* taken = pw_stream_dequeue_buffer(camera->device.stream);
  if (!taken) return;  // the viewer is slow: this picture is lost, as a camera's would be
  const int64_t time = now();
  const uint64_t number = camera->tells_time ? (uint64_t)time / SPA_NSEC_PER_MSEC : camera->device.taken;
  struct spa_data* plane = &taken->buffer->datas[0];
  if (plane->data) draw(camera, plane->data, (uint32_t)number);
  plane->chunk->offset = 0;
  plane->chunk->stride = camera->width * 2;
  plane->chunk->size = (uint32_t)(camera->width * camera->height * 2);
  struct spa_meta_header* header = spa_buffer_find_meta_data(taken->buffer, SPA_META_Header, sizeof *header);
  if (header) {
    header->pts = time;
    header->flags = 0;
    header->seq = camera->device.taken;
    header->dts_offset = 0;
  }
  pw_stream_queue_buffer(camera->device.stream, taken);
}

static void on_param(void* data, uint32_t id, const struct spa_pod* param) {
  struct camera* camera = data;
  if (id != SPA_PARAM_Format || !param) return;
  uint8_t space[1024];
  struct spa_pod_builder builder = SPA_POD_BUILDER_INIT(space, sizeof space);
  const struct spa_pod* params[2];
  params[0] = spa_pod_builder_add_object(&builder, SPA_TYPE_OBJECT_ParamBuffers, SPA_PARAM_Buffers,
                                         SPA_PARAM_BUFFERS_buffers, SPA_POD_CHOICE_RANGE_Int(8, 2, 16),
                                         SPA_PARAM_BUFFERS_blocks, SPA_POD_Int(1), SPA_PARAM_BUFFERS_size,
                                         SPA_POD_Int(camera->width * camera->height * 2),
                                         SPA_PARAM_BUFFERS_stride, SPA_POD_Int(camera->width * 2));
  params[1] = spa_pod_builder_add_object(&builder, SPA_TYPE_OBJECT_ParamMeta, SPA_PARAM_Meta,
                                         SPA_PARAM_META_type, SPA_POD_Id(SPA_META_Header),
                                         SPA_PARAM_META_size, SPA_POD_Int(sizeof(struct spa_meta_header)));
  pw_stream_update_params(camera->device.stream, params, 2);
}

static const struct pw_stream_events kEvents = {PW_VERSION_STREAM_EVENTS, .process = on_process,
                                                .state_changed = on_state, .param_changed = on_param};

int main(int argc, char** argv) {
  if (argc != 8) return 64;
  const uint32_t rate = (uint32_t)atoi(argv[5]);
  struct camera camera = {.width = atoi(argv[3]), .height = atoi(argv[4])};
  camera.device.rate = rate * (1 + atof(argv[6]) * 1e-6);
  camera.device.period = 1;
  camera.tells_time = strcmp(argv[7], "ms") == 0;
  set_up(&camera.device, argv[1], argv[2],
         pw_properties_new(PW_KEY_MEDIA_CLASS, "Video/Source", PW_KEY_MEDIA_ROLE, "Camera", NULL), &kEvents);
  uint8_t space[1024];
  struct spa_pod_builder builder = SPA_POD_BUILDER_INIT(space, sizeof space);
  struct spa_video_info_raw format = {
      .format = SPA_VIDEO_FORMAT_YUY2,
      .size = SPA_RECTANGLE((uint32_t)camera.width, (uint32_t)camera.height),
      .framerate = SPA_FRACTION(rate, 1),
  };
  return run(&camera.device, spa_format_video_raw_build(&builder, SPA_PARAM_EnumFormat, &format));
}

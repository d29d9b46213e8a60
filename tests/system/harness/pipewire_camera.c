// A camera in PipeWire: a node with YUY2 pictures of one size and rate, each with its number in the top row
// of cells (see movie.counters) and the time when it was taken. Arguments: NAME WIDTH HEIGHT RATE API, the
// last being what drives the hardware, or empty.
#include <pipewire/pipewire.h>
#include <spa/param/video/format-utils.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>

enum { kCells = 32, kRows = 18 };

struct camera {
  struct pw_main_loop* loop;
  struct pw_stream* stream;
  struct spa_source* timer;
  int width, height, rate;
  uint32_t number;
};

static int64_t now(void) {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * SPA_NSEC_PER_SEC + time.tv_nsec;
}

static void draw(const struct camera* camera, uint8_t* picture) {
  const int stride = camera->width * 2;
  for (int y = 0; y < camera->height; ++y) {
    uint8_t* row = picture + y * stride;
    for (int x = 0; x < camera->width; ++x) {
      const uint32_t cell = (uint32_t)(x * kCells / camera->width);
      const int set = camera->number >> (kCells - 1 - cell) & 1;
      row[2 * x] = y >= camera->height / kRows ? (uint8_t)(90 + (y + camera->number) % 40) : set ? 235 : 16;
      row[2 * x + 1] = 128;
    }
  }
}

static void on_process(void* data) {
  struct camera* camera = data;
  struct pw_buffer* taken = pw_stream_dequeue_buffer(camera->stream);
  if (!taken) return;  // the viewer is slow: this picture is lost, as a camera's would be
  struct spa_data* plane = &taken->buffer->datas[0];
  if (plane->data) draw(camera, plane->data);
  plane->chunk->offset = 0;
  plane->chunk->stride = camera->width * 2;
  plane->chunk->size = (uint32_t)(camera->width * camera->height * 2);
  struct spa_meta_header* header = spa_buffer_find_meta_data(taken->buffer, SPA_META_Header, sizeof *header);
  if (header) {
    header->pts = now();
    header->flags = 0;
    header->seq = camera->number;
    header->dts_offset = 0;
  }
  ++camera->number;
  pw_stream_queue_buffer(camera->stream, taken);
}

static void on_tick(void* data, uint64_t expirations) {
  (void)expirations;
  struct camera* camera = data;
  pw_stream_trigger_process(camera->stream);
}

static void on_state(void* data, enum pw_stream_state old, enum pw_stream_state state, const char* error) {
  (void)old;
  struct camera* camera = data;
  struct timespec interval = {0, SPA_NSEC_PER_SEC / camera->rate};
  struct timespec none = {0, 0};
  if (error) fprintf(stderr, "%s\n", error);
  const int runs = state == PW_STREAM_STATE_STREAMING;
  struct timespec* wanted = runs ? &interval : &none;
  pw_loop_update_timer(pw_main_loop_get_loop(camera->loop), camera->timer, wanted, wanted, false);
  if (state == PW_STREAM_STATE_ERROR) pw_main_loop_quit(camera->loop);
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
  pw_stream_update_params(camera->stream, params, 2);
}

static const struct pw_stream_events kEvents = {PW_VERSION_STREAM_EVENTS, .process = on_process,
                                                .state_changed = on_state, .param_changed = on_param};

int main(int argc, char** argv) {
  if (argc != 6) return 64;
  struct camera camera = {.width = atoi(argv[2]), .height = atoi(argv[3]), .rate = atoi(argv[4])};
  pw_init(NULL, NULL);
  camera.loop = pw_main_loop_new(NULL);
  camera.timer = pw_loop_add_timer(pw_main_loop_get_loop(camera.loop), on_tick, &camera);
  struct pw_properties* properties =
      pw_properties_new(PW_KEY_MEDIA_CLASS, "Video/Source", PW_KEY_NODE_NAME, argv[1],
                        PW_KEY_NODE_DESCRIPTION, argv[1], PW_KEY_MEDIA_ROLE, "Camera", NULL);
  if (argv[5][0]) pw_properties_set(properties, PW_KEY_DEVICE_API, argv[5]);
  camera.stream =
      pw_stream_new_simple(pw_main_loop_get_loop(camera.loop), argv[1], properties, &kEvents, &camera);
  uint8_t space[1024];
  struct spa_pod_builder builder = SPA_POD_BUILDER_INIT(space, sizeof space);
  struct spa_video_info_raw format = {
      .format = SPA_VIDEO_FORMAT_YUY2,
      .size = SPA_RECTANGLE((uint32_t)camera.width, (uint32_t)camera.height),
      .framerate = SPA_FRACTION((uint32_t)camera.rate, 1),
  };
  const struct spa_pod* params[1] = {spa_format_video_raw_build(&builder, SPA_PARAM_EnumFormat, &format)};
  if (pw_stream_connect(camera.stream, PW_DIRECTION_OUTPUT, PW_ID_ANY,
                        PW_STREAM_FLAG_DRIVER | PW_STREAM_FLAG_MAP_BUFFERS, params, 1) < 0)
    return 1;
  return pw_main_loop_run(camera.loop) < 0;
}

// Devices that come and go as fast as PipeWire takes them: cameras and microphones that no sooner are announced than
// they are gone. Arguments: NAME SLOTS, where so many are there at a time at most. Says "coming" once the first has been
// announced; runs until it is ended.
#include <pipewire/pipewire.h>
#include <spa/param/audio/format-utils.h>
#include <spa/param/video/format-utils.h>
#include <stdio.h>
#include <stdlib.h>

enum { kMostSlots = 64 };

struct fleeting {
  struct pw_core* core;
  struct pw_stream* slots[kMostSlots];
  const char* name;
  int count;
  uint32_t made;
};

static struct pw_stream* appear(struct fleeting* all) {
  const int camera = all->made++ % 2;
  struct pw_properties* properties =
      pw_properties_new(PW_KEY_MEDIA_CLASS, camera ? "Video/Source" : "Audio/Source", NULL);
  pw_properties_setf(properties, PW_KEY_NODE_NAME, "%s-%u", all->name, all->made);
  struct pw_stream* stream = pw_stream_new(all->core, all->name, properties);
  uint8_t space[1024];
  struct spa_pod_builder builder = SPA_POD_BUILDER_INIT(space, sizeof space);
  struct spa_video_info_raw pictures = {
      .format = SPA_VIDEO_FORMAT_YUY2, .size = SPA_RECTANGLE(320, 180), .framerate = SPA_FRACTION(30, 1)};
  struct spa_audio_info_raw sound = {.format = SPA_AUDIO_FORMAT_F32, .rate = 48000, .channels = 2};
  const struct spa_pod* format =
      camera ? spa_format_video_raw_build(&builder, SPA_PARAM_EnumFormat, &pictures)
             : spa_format_audio_raw_build(&builder, SPA_PARAM_EnumFormat, &sound);
  pw_stream_connect(stream, PW_DIRECTION_OUTPUT, PW_ID_ANY, PW_STREAM_FLAG_DRIVER, &format, 1);
  return stream;
}

// As often as the server answers, something comes or goes.
static void on_done(void* data, uint32_t id, int seq) {
  (void)id;
  (void)seq;
  struct fleeting* all = data;
  if (all->made == 1) {
    puts("coming");
    fflush(stdout);
  }
  struct pw_stream** slot = &all->slots[random() % all->count];
  if (*slot) {
    pw_stream_destroy(*slot);
    *slot = NULL;
  } else {
    *slot = appear(all);
  }
  pw_core_sync(all->core, PW_ID_CORE, 0);
}

static void on_error(void* data, uint32_t id, int seq, int result, const char* message) {
  (void)data;
  (void)seq;
  (void)message;
  if (id == PW_ID_CORE && result == -EPIPE) exit(1);  // the server has ended
}

static const struct pw_core_events kEvents = {PW_VERSION_CORE_EVENTS, .done = on_done, .error = on_error};

int main(int argc, char** argv) {
  if (argc != 3) return 64;
  struct fleeting all = {.name = argv[1], .count = atoi(argv[2])};
  if (all.count < 1 || all.count > kMostSlots) return 64;
  pw_init(NULL, NULL);
  struct pw_main_loop* loop = pw_main_loop_new(NULL);
  struct pw_context* context = pw_context_new(pw_main_loop_get_loop(loop), NULL, 0);
  all.core = pw_context_connect(context, NULL, 0);
  if (!all.core) return 1;
  struct spa_hook listener;
  pw_core_add_listener(all.core, &listener, &kEvents, &all);
  pw_core_sync(all.core, PW_ID_CORE, 0);
  return pw_main_loop_run(loop) < 0;
}

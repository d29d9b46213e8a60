// A microphone in PipeWire that drives its graph as a sound card does: each of its cycles comes when its last sample
// has been taken, and its samples are taken by a clock of its own. Arguments: NAME API PPM JITTER HERTZ, where API is
// what drives the hardware, or empty, PPM says by how many parts in a million the clock is fast, and JITTER by how many
// milliseconds at most a cycle is late. The world it hears has a steady sine of so many HERTZ, or, with 0, a burst of
// 20 ms that begins at each whole second of CLOCK_MONOTONIC.
#include <math.h>
#include <spa/param/audio/format-utils.h>

#include "pipewire_device.h"

enum { kRate = 48000 };
static const double kBurstSeconds = 0.020, kBurstHertz = 1000, kLoudness = 0.5;

struct microphone {
  struct device device;  // first: what happens is told with its address
  double hertz;
};

// What is to be heard at a time, ns of CLOCK_MONOTONIC.
static float world(double hertz, int64_t time) {
  const double since = (double)(time % (int64_t)SPA_NSEC_PER_SEC) / SPA_NSEC_PER_SEC;
  if (hertz > 0) return (float)(kLoudness * sin(2 * M_PI * hertz * since));  // whole periods in each second
  if (since >= kBurstSeconds) return 0;
  return (float)(kLoudness * pow(sin(M_PI * since / kBurstSeconds), 2) * sin(2 * M_PI * kBurstHertz * since));
}

// As a sound card's driver keeps it.
static void set_clock(const struct device* device) {
  struct spa_io_clock* clock = &device->position->clock;
  clock->nsec = (uint64_t)now();
  clock->rate = SPA_FRACTION(1, kRate);
  clock->position = device->taken + device->period;
  clock->duration = device->period;
  clock->delay = 0;
  clock->rate_diff = device->rate / kRate;
  clock->next_nsec = (uint64_t)time_of(device, device->taken + 2 * device->period);
}

static void on_process(void* data) {
  struct microphone* microphone = data;
  const struct device* device = &microphone->device;
  if (device->position) set_clock(device);
  struct pw_buffer* taken = pw_stream_dequeue_buffer(device->stream);
  if (!taken) return;  // the listener is slow: this sound is lost, as a card's would be
  struct spa_data* plane = &taken->buffer->datas[0];
  float* samples = plane->data;
  const uint64_t count = SPA_MIN(device->period, plane->maxsize / sizeof *samples);
  for (uint64_t i = 0; samples && i < count; ++i)
    samples[i] = world(microphone->hertz, time_of(device, device->taken + i));
  plane->chunk->offset = 0;
  plane->chunk->stride = sizeof *samples;
  plane->chunk->size = (uint32_t)(count * sizeof *samples);
  pw_stream_queue_buffer(device->stream, taken);
}

static void on_io(void* data, uint32_t id, void* area, uint32_t size) {
  (void)size;
  struct device* device = data;
  if (id == SPA_IO_Position) device->position = area;
}

static const struct pw_stream_events kEvents = {PW_VERSION_STREAM_EVENTS, .process = on_process,
                                                .state_changed = on_state, .io_changed = on_io};

int main(int argc, char** argv) {
  if (argc != 6) return 64;
  struct microphone microphone = {.hertz = atof(argv[5])};
  microphone.device.rate = kRate * (1 + atof(argv[3]) * 1e-6);
  microphone.device.jitter = (int64_t)(atof(argv[4]) * SPA_NSEC_PER_MSEC);
  microphone.device.period = 1024;
  set_up(&microphone.device, argv[1], argv[2], pw_properties_new(PW_KEY_MEDIA_CLASS, "Audio/Source", NULL), &kEvents);
  uint8_t space[1024];
  struct spa_pod_builder builder = SPA_POD_BUILDER_INIT(space, sizeof space);
  struct spa_audio_info_raw format = {
      .format = SPA_AUDIO_FORMAT_F32, .rate = kRate, .channels = 1, .position = {SPA_AUDIO_CHANNEL_MONO}};
  return run(&microphone.device, spa_format_audio_raw_build(&builder, SPA_PARAM_EnumFormat, &format));
}

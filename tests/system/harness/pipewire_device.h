// What the virtual camera and the virtual microphone of PipeWire share: a stream that drives its graph by a
// clock of the device's own, which may be fast or slow against the machine's.
#pragma once
#include <pipewire/pipewire.h>
#include <sched.h>
#include <stdio.h>
#include <stdlib.h>
#include <time.h>

struct device {
  struct pw_main_loop* loop;
  struct pw_stream* stream;
  struct spa_source* timer;
  double rate;      // pictures or samples in a second of CLOCK_MONOTONIC
  int64_t begin;    // when the first of them was taken, ns of CLOCK_MONOTONIC
  uint64_t taken;   // pictures or samples so far
  uint64_t period;  // of them in one cycle of the graph
  int64_t jitter;   // a cycle comes up to so many ns late
  // The graph's clock, where its cycles decide about the period.
  struct spa_io_position* position;
};

static int64_t now(void) {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * SPA_NSEC_PER_SEC + time.tv_nsec;
}

// When a picture or sample is taken, ns of CLOCK_MONOTONIC.
static int64_t time_of(const struct device* device, uint64_t number) {
  return device->begin + (int64_t)((double)number / device->rate * SPA_NSEC_PER_SEC);
}

// The next cycle comes when all that belongs to it has been taken. What is late already comes at once.
static void await_cycle(struct device* device) {
  int64_t due = time_of(device, device->taken + device->period);
  if (device->jitter) due += random() % device->jitter;
  struct timespec at = {due / SPA_NSEC_PER_SEC, due % SPA_NSEC_PER_SEC};
  pw_loop_update_timer(pw_main_loop_get_loop(device->loop), device->timer, &at, NULL, true);
}

static void on_tick(void* data, uint64_t expirations) {
  (void)expirations;
  struct device* device = data;
  pw_stream_trigger_process(device->stream);
  device->taken += device->period;
  if (device->position) device->period = device->position->clock.duration;
  await_cycle(device);
}

static void on_state(void* data, enum pw_stream_state old, enum pw_stream_state state, const char* error) {
  (void)old;
  struct device* device = data;
  if (error) fprintf(stderr, "%s\n", error);
  if (state == PW_STREAM_STATE_STREAMING) {
    device->begin += now() - time_of(device, device->taken);  // it has rested
    await_cycle(device);
  } else {
    struct timespec none = {0, 0};
    pw_loop_update_timer(pw_main_loop_get_loop(device->loop), device->timer, &none, &none, false);
  }
  if (state == PW_STREAM_STATE_ERROR) pw_main_loop_quit(device->loop);
}

// Makes the loop and the stream. @param api  what drives the hardware, or empty
static void set_up(struct device* device, const char* name, const char* api, struct pw_properties* properties,
                   const struct pw_stream_events* events) {
  // Hardware does not wait for a processor. Without the right to it, it does.
  sched_setscheduler(0, SCHED_FIFO, &(struct sched_param){.sched_priority = 20});
  pw_init(NULL, NULL);
  device->loop = pw_main_loop_new(NULL);
  struct pw_loop* loop = pw_main_loop_get_loop(device->loop);
  device->timer = pw_loop_add_timer(loop, on_tick, device);
  pw_properties_setf(properties, PW_KEY_NODE_NAME, "%s", name);
  pw_properties_setf(properties, PW_KEY_NODE_DESCRIPTION, "%s", name);
  if (api[0]) pw_properties_set(properties, PW_KEY_DEVICE_API, api);
  device->stream = pw_stream_new_simple(loop, name, properties, events, device);
}

// Offers one format and delivers in it until the program is ended.
static int run(struct device* device, const struct spa_pod* format) {
  const struct spa_pod* params[1] = {format};
  if (pw_stream_connect(device->stream, PW_DIRECTION_OUTPUT, PW_ID_ANY,
                        PW_STREAM_FLAG_DRIVER | PW_STREAM_FLAG_MAP_BUFFERS, params, 1) < 0)
    return 1;
  return pw_main_loop_run(device->loop) < 0;
}

// A microphone in ALSA with a clock of its own, which one program at a time may open, as with a card. Left it hears
// a burst of 2 kHz around each whole second of CLOCK_MONOTONIC, right a sine of 440 Hz that never breaks off: what
// the world sounds like does not depend on the clock that it is sampled by. Keys of the definition (times in ms):
//   lock FILE                     taken while it is open; a byte longer with each overrun
//   ppm N                         how much faster its clock runs than the machine's, parts in a million
//   jitter N                      periods are reported up to so much late, by chance
//   open_takes N, close_takes N   how long the driver needs
//   open_waits FILE, close_waits FILE   the driver does not return while there is such a file
#include <alsa/asoundlib.h>
#include <alsa/pcm_external.h>
#include <fcntl.h>
#include <math.h>
#include <stdint.h>
#include <sys/file.h>
#include <sys/timerfd.h>
#include <time.h>
#include <unistd.h>

enum { kRate = 48000, kChannels = 2 };
#define PI 3.14159265358979323846

struct device {
  snd_pcm_ioplug_t plug;
  int timer, lock;
  double rate;    // frames a second by the machine's clock
  double jitter;  // seconds
  double begun;   // when the first frame was heard; 0 while it stands still
  int64_t reported, taken;  // frames since then
  long close_takes;
  char* close_waits;
};

struct wish {
  const char *lock, *open_waits, *close_waits;
  long ppm, jitter, open_takes, close_takes;
};

static double now(void) {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return (double)time.tv_sec + (double)time.tv_nsec / 1e9;
}

static struct timespec span(double seconds) {
  return (struct timespec){(time_t)seconds, (long)((seconds - floor(seconds)) * 1e9)};
}

static void take_time(long milliseconds, const char* file) {
  const struct timespec while_busy = span((double)milliseconds / 1000), step = span(0.01);
  nanosleep(&while_busy, NULL);
  while (file && access(file, F_OK) == 0) nanosleep(&step, NULL);
}

// ---- what it hears

static double burst(double time) {
  const double width = 0.010, away = time - round(time);
  return fabs(away) < width ? (1 + cos(PI * away / width)) / 2 * sin(2 * PI * 2000 * away) : 0;
}

static double hum(double time) { return sin(2 * PI * 440 * fmod(time, 1)); }

static snd_pcm_sframes_t transfer(snd_pcm_ioplug_t* plug, const snd_pcm_channel_area_t* areas,
                                  snd_pcm_uframes_t offset, snd_pcm_uframes_t size) {
  struct device* device = plug->private_data;
  for (snd_pcm_uframes_t i = 0; i < size; ++i) {
    const double time = device->begun + (double)(device->taken + (int64_t)i) / device->rate;
    for (int channel = 0; channel < kChannels; ++channel) {
      const snd_pcm_channel_area_t* area = &areas[channel];
      char* place = (char*)area->addr + (area->first + area->step * (offset + i)) / 8;
      *(int16_t*)place = (int16_t)lrint(16000 * (channel == 0 ? burst(time) : hum(time)));
    }
  }
  device->taken += (int64_t)size;
  return (snd_pcm_sframes_t)size;
}

// ---- its clock

/// When the device reports a period, seconds since it began: each as late as its number wills.
static double report_time(const struct device* device, int64_t period) {
  const uint64_t mixed = (uint64_t)period * 0x9E3779B97F4A7C15u;
  const double chance = (double)((mixed ^ mixed >> 29) * 0xBF58476D1CE4E5B9u >> 40) / (1 << 24);
  return (double)(period * (int64_t)device->plug.period_size) / device->rate + chance * device->jitter;
}

static snd_pcm_sframes_t pointer(snd_pcm_ioplug_t* plug) {
  struct device* device = plug->private_data;
  const int64_t size = (int64_t)plug->period_size;
  if (device->begun == 0) return (snd_pcm_sframes_t)device->reported;
  const double passed = now() - device->begun;
  while (report_time(device, device->reported / size + 1) <= passed) device->reported += size;
  if (device->reported - device->taken <= (int64_t)plug->buffer_size) return (snd_pcm_sframes_t)device->reported;
  if (device->lock >= 0 && write(device->lock, "!", 1) < 0) SNDERR("the overrun can't be noted");
  return -EPIPE;
}

static void wake_at_next_period(struct device* device) {
  const int64_t next = device->reported / (int64_t)device->plug.period_size + 1;
  const struct itimerspec when = {.it_value = span(device->begun + report_time(device, next))};
  timerfd_settime(device->timer, TFD_TIMER_ABSTIME, &when, NULL);
}

static int start(snd_pcm_ioplug_t* plug) {
  struct device* device = plug->private_data;
  device->begun = now();
  wake_at_next_period(device);
  return 0;
}

static int stop(snd_pcm_ioplug_t* plug) {
  struct device* device = plug->private_data;
  const struct itimerspec never = {0};
  device->begun = 0;
  return timerfd_settime(device->timer, 0, &never, NULL);
}

static int prepare(snd_pcm_ioplug_t* plug) {
  struct device* device = plug->private_data;
  device->begun = 0;
  device->reported = device->taken = 0;
  return 0;
}

static int poll_revents(snd_pcm_ioplug_t* plug, struct pollfd* polled, unsigned count, unsigned short* events) {
  struct device* device = plug->private_data;
  uint64_t times;
  *events = count > 0 && polled[0].revents & POLLIN ? POLLIN : 0;
  if (*events && read(device->timer, &times, sizeof times) < 0) return 0;
  pointer(plug);
  if (device->begun != 0) wake_at_next_period(device);
  return 0;
}

// ---- opening and closing

static int close_device(snd_pcm_ioplug_t* plug) {
  struct device* device = plug->private_data;
  take_time(device->close_takes, device->close_waits);
  if (device->lock >= 0) close(device->lock);
  if (device->timer >= 0) close(device->timer);
  free(device->close_waits);
  free(device);
  return 0;
}

static const snd_pcm_ioplug_callback_t kCallbacks = {.start = start, .stop = stop, .pointer = pointer,
                                                     .transfer = transfer, .close = close_device,
                                                     .prepare = prepare, .poll_revents = poll_revents};

static int offer_formats(snd_pcm_ioplug_t* plug) {
  const unsigned access[] = {SND_PCM_ACCESS_RW_INTERLEAVED}, format[] = {SND_PCM_FORMAT_S16_LE};
  int problem = snd_pcm_ioplug_set_param_list(plug, SND_PCM_IOPLUG_HW_ACCESS, 1, access);
  if (!problem) problem = snd_pcm_ioplug_set_param_list(plug, SND_PCM_IOPLUG_HW_FORMAT, 1, format);
  if (!problem) problem = snd_pcm_ioplug_set_param_minmax(plug, SND_PCM_IOPLUG_HW_RATE, kRate, kRate);
  if (!problem) problem = snd_pcm_ioplug_set_param_minmax(plug, SND_PCM_IOPLUG_HW_CHANNELS, kChannels, kChannels);
  if (!problem) problem = snd_pcm_ioplug_set_param_minmax(plug, SND_PCM_IOPLUG_HW_PERIOD_BYTES, 960, 1 << 13);
  if (!problem) problem = snd_pcm_ioplug_set_param_minmax(plug, SND_PCM_IOPLUG_HW_PERIODS, 2, 256);
  return problem;
}

static int read_wish(const snd_config_t* conf, struct wish* wish) {
  snd_config_iterator_t i, next;
  snd_config_for_each(i, next, conf) {
    const snd_config_t* entry = snd_config_iterator_entry(i);
    const char* key;
    if (snd_config_get_id(entry, &key) < 0) continue;
    const struct { const char* key; const char** text; long* number; } known[] = {
        {"lock", &wish->lock, NULL},
        {"open_waits", &wish->open_waits, NULL},
        {"close_waits", &wish->close_waits, NULL},
        {"ppm", NULL, &wish->ppm},
        {"jitter", NULL, &wish->jitter},
        {"open_takes", NULL, &wish->open_takes},
        {"close_takes", NULL, &wish->close_takes},
    };
    int problem = strcmp(key, "type") == 0 ? 0 : -EINVAL;
    for (size_t n = 0; n < sizeof known / sizeof *known; ++n) {
      if (strcmp(key, known[n].key) != 0) continue;
      problem = known[n].text ? snd_config_get_string(entry, known[n].text)
                              : snd_config_get_integer(entry, known[n].number);
    }
    if (problem < 0) return SNDERR("what is %s?", key), problem;
  }
  return 0;
}

static int lock(const char* file) {
  const int lock = open(file, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0666);
  if (lock < 0) return -errno;
  if (flock(lock, LOCK_EX | LOCK_NB) == 0) return lock;
  close(lock);
  return -EBUSY;
}

static struct device* new_device(const struct wish* wish, int lock) {
  struct device* device = calloc(1, sizeof *device);
  device->lock = lock;
  device->timer = timerfd_create(CLOCK_MONOTONIC, TFD_NONBLOCK | TFD_CLOEXEC);
  device->rate = kRate * (1 + (double)wish->ppm / 1e6);
  device->jitter = (double)wish->jitter / 1e3;
  device->close_takes = wish->close_takes;
  device->close_waits = wish->close_waits ? strdup(wish->close_waits) : NULL;
  device->plug = (snd_pcm_ioplug_t){.version = SND_PCM_IOPLUG_VERSION, .name = "a microphone of the tests",
                                    .flags = SND_PCM_IOPLUG_FLAG_BOUNDARY_WA | SND_PCM_IOPLUG_FLAG_MONOTONIC,
                                    .poll_fd = device->timer, .poll_events = POLLIN,
                                    .callback = &kCallbacks, .private_data = device};
  return device;
}

SND_PCM_PLUGIN_DEFINE_FUNC(lecture_hall) {
  (void)root;
  if (stream != SND_PCM_STREAM_CAPTURE) return -EINVAL;
  struct wish wish = {0};
  int problem = read_wish(conf, &wish);
  if (problem < 0) return problem;
  const int locked = wish.lock ? lock(wish.lock) : -1;
  if (wish.lock && locked < 0) return locked;
  take_time(wish.open_takes, wish.open_waits);
  struct device* device = new_device(&wish, locked);
  problem = snd_pcm_ioplug_create(&device->plug, name, stream, mode);
  if (problem < 0) return close_device(&device->plug), problem;
  problem = offer_formats(&device->plug);
  if (problem < 0) return snd_pcm_ioplug_delete(&device->plug), problem;
  *pcmp = device->plug.pcm;
  return 0;
}

SND_PCM_PLUGIN_SYMBOL(lecture_hall)

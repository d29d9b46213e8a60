// Loaded into the daemon: making a directory takes $SLOW_MKDIR_MS milliseconds, as on a busy network volume.
#define _GNU_SOURCE
#include <dlfcn.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <time.h>

int mkdir(const char* path, mode_t mode) {
  static int (*real)(const char*, mode_t);
  if (!real) real = (int (*)(const char*, mode_t))dlsym(RTLD_NEXT, "mkdir");
  const char* text = getenv("SLOW_MKDIR_MS");
  const long milliseconds = text ? atol(text) : 0;
  const struct timespec pause = {milliseconds / 1000, milliseconds % 1000 * 1000000};
  nanosleep(&pause, NULL);
  return real(path, mode);
}

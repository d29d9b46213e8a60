// Loaded into the daemon: keeps what its syncs have made durable, and ends the daemon at a chosen moment as a
// power cut does. Below $POWER_CUT:
//   files/KEY  content of a file at its last sync
//   dirs/KEY   names in a directory at its last sync: a number that rises from sync to sync, then "NAME KEY
//   d|f" a line top        key of the directory $POWER_CUT_TOP armed      written by the test: how many more
//   syncs count after the next "cmdStatus=0" that is sent
// A KEY is inode and birth time, since inodes are used again. With $POWER_CUT_NAMES "together" any sync makes
// the names in all directories below the top durable, as the journal of most file systems does; with "apart"
// each directory needs a sync of its own.
#define _GNU_SOURCE
#include <dirent.h>
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <pthread.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

enum { kPath = 512, kNotArmed = -1 };

static pthread_mutex_t lock = PTHREAD_MUTEX_INITIALIZER;
static const char* place;  // null in the daemon's children
static int together;       // one sync makes all names durable
static int top = -1;
static int number;            // of the last directory's sync
static int left = kNotArmed;  // syncs until the cut
static int cut;               // what comes now is lost

static void fail(const char* what) {
  fprintf(stderr, "power_cut: %s: %s\n", what, strerror(errno));
  abort();
}

static void key_of(int directory, const char* name, char* key, size_t size) {
  struct statx status;
  if (statx(directory, name, AT_SYMLINK_NOFOLLOW | AT_EMPTY_PATH, STATX_INO | STATX_BTIME, &status) != 0) {
    key[0] = 0;  // it has gone meanwhile
    return;
  }
  snprintf(key, size, "%llu-%lld-%u", (unsigned long long)status.stx_ino, (long long)status.stx_btime.tv_sec,
           status.stx_btime.tv_nsec);
}

static void path_of(char* path, const char* kind, const char* name, const char* ending) {
  snprintf(path, kPath, "%s/%s%s%s", place, kind, name, ending);
}

static void put(const char* kind, const char* name, void (*write_to)(FILE*, int), int fd) {
  char temporary[kPath], path[kPath];
  path_of(temporary, kind, name, ".new");
  path_of(path, kind, name, "");
  FILE* file = fopen(temporary, "w");
  if (!file) fail(temporary);
  write_to(file, fd);
  if (fclose(file) != 0 || rename(temporary, path) != 0) fail(path);
}

static void write_content(FILE* file, int fd) {
  char self[64], buffer[65536];
  snprintf(self, sizeof self, "/proc/self/fd/%d", fd);
  const int source = open(self, O_RDONLY | O_CLOEXEC);
  if (source < 0) fail(self);
  for (ssize_t n; (n = read(source, buffer, sizeof buffer)) > 0;) fwrite(buffer, 1, (size_t)n, file);
  close(source);
}

static void write_names(FILE* file, int fd) {
  DIR* directory = fdopendir(openat(fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!directory) fail("a directory");
  fprintf(file, "%d\n", ++number);
  for (struct dirent* entry; (entry = readdir(directory)) != NULL;) {
    if (strcmp(entry->d_name, ".") == 0 || strcmp(entry->d_name, "..") == 0) continue;
    char key[80];
    key_of(fd, entry->d_name, key, sizeof key);
    if (key[0]) fprintf(file, "%s %s %c\n", entry->d_name, key, entry->d_type == DT_DIR ? 'd' : 'f');
  }
  closedir(directory);
}

static void keep_names(int fd) {
  char key[80];
  key_of(fd, "", key, sizeof key);
  put("dirs/", key, write_names, fd);
}

static void keep_all_names(int fd) {
  keep_names(fd);
  DIR* directory = fdopendir(openat(fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!directory) fail("a directory");
  for (struct dirent* entry; (entry = readdir(directory)) != NULL;) {
    if (entry->d_type != DT_DIR || strcmp(entry->d_name, ".") == 0 || strcmp(entry->d_name, "..") == 0)
      continue;
    const int inner = openat(fd, entry->d_name, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (inner < 0) continue;  // it has gone meanwhile
    keep_all_names(inner);
    close(inner);
  }
  closedir(directory);
}

static void keep(int fd) {
  struct stat status;
  char key[80];
  if (fstat(fd, &status) != 0) fail("a descriptor");
  key_of(fd, "", key, sizeof key);
  if (S_ISREG(status.st_mode)) put("files/", key, write_content, fd);
  if (together) {
    keep_all_names(top);
  } else if (S_ISDIR(status.st_mode)) {
    keep_names(fd);
  }
}

static void write_top(FILE* file, int fd) {
  char key[80];
  key_of(fd, "", key, sizeof key);
  fputs(key, file);
}

__attribute__((constructor)) static void begin(void) {
  place = getenv("POWER_CUT");
  const char* path = getenv("POWER_CUT_TOP");
  const char* names = getenv("POWER_CUT_NAMES");
  if (!place || !path || !names) return;
  place = strdup(place);
  together = strcmp(names, "together") == 0;
  top = open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (top < 0) fail(path);
  put("", "top", write_top, top);
  unsetenv("POWER_CUT");  // not for the daemon's children
  unsetenv("LD_PRELOAD");
}

static void end_now(void) {
  cut = 1;
  kill(getpid(), SIGKILL);
  for (;;) pause();
}

static int synced(int result, int fd) {
  if (!place || result != 0) return result;
  const int error = errno;
  pthread_mutex_lock(&lock);
  if (!cut) keep(fd);
  if (left > 0 && --left == 0) end_now();
  pthread_mutex_unlock(&lock);
  errno = error;
  return result;
}

int fsync(int fd) {
  static int (*real)(int);
  if (!real) real = (int (*)(int))dlsym(RTLD_NEXT, "fsync");
  return synced(real(fd), fd);
}

int fdatasync(int fd) {
  static int (*real)(int);
  if (!real) real = (int (*)(int))dlsym(RTLD_NEXT, "fdatasync");
  return synced(real(fd), fd);
}

// Reads and removes what arms the cut. @return how many syncs still count, kNotArmed without such a file
static int armed(void) {
  char path[kPath];
  int syncs = kNotArmed;
  path_of(path, "armed", "", "");
  FILE* file = fopen(path, "r");
  if (!file) return kNotArmed;
  if (fscanf(file, "%d", &syncs) != 1) fail(path);
  fclose(file);
  unlink(path);
  return syncs;
}

ssize_t send(int fd, const void* data, size_t size, int flags) {
  static ssize_t (*real)(int, const void*, size_t, int);
  static const char kAnswer[] = "cmdStatus=0";
  if (!real) real = (ssize_t(*)(int, const void*, size_t, int))dlsym(RTLD_NEXT, "send");
  if (!place || size < sizeof kAnswer - 1 || memcmp(data, kAnswer, sizeof kAnswer - 1) != 0)
    return real(fd, data, size, flags);
  pthread_mutex_lock(&lock);  // no sync falls between the answer and the beginning of the count
  const int syncs = armed();
  const ssize_t sent = real(fd, data, size, flags);
  if (syncs == 0) end_now();
  if (syncs > 0) left = syncs;
  pthread_mutex_unlock(&lock);
  return sent;
}

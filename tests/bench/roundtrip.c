// Both ends of a round trip over a local stream socket, for comparing servers through the same client.
//   roundtrip serve PATH              answers each received chunk with the same bytes, one peer at a time
//   roundtrip ask PATH COUNT LINE     one connection, COUNT times LINE; nanoseconds of each reply, one a line
//   roundtrip connect PATH COUNT LINE the same with a connection of its own for each
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <time.h>
#include <unistd.h>

static struct sockaddr_un address(const char* path) {
  struct sockaddr_un name = {.sun_family = AF_UNIX};
  if (strlen(path) >= sizeof name.sun_path) {
    fprintf(stderr, "roundtrip: path too long: %s\n", path);
    exit(1);
  }
  strcpy(name.sun_path, path);
  return name;
}

static void check(int good, const char* what) {
  if (good) return;
  perror(what);
  exit(1);
}

static int connected(const char* path) {
  const struct sockaddr_un name = address(path);
  const int peer = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  check(connect(peer, (const struct sockaddr*)&name, sizeof name) == 0, "connect");
  return peer;
}

static void serve(const char* path) {
  const struct sockaddr_un name = address(path);
  const int listening = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  check(bind(listening, (const struct sockaddr*)&name, sizeof name) == 0, "bind");
  check(listen(listening, 16) == 0, "listen");
  for (;;) {
    const int peer = accept(listening, NULL, NULL);
    check(peer >= 0, "accept");
    char buffer[4096];
    for (ssize_t size; (size = recv(peer, buffer, sizeof buffer, 0)) > 0;) {
      check(send(peer, buffer, (size_t)size, MSG_NOSIGNAL) == size, "send");
    }
    close(peer);
  }
}

static long long now(void) {
  struct timespec time;
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * 1000000000LL + time.tv_nsec;
}

static void ask(const char* path, int count, const char* line, int connectEach) {
  char request[4096];
  const size_t size = (size_t)snprintf(request, sizeof request, "%s\n", line);
  long long* spent = calloc((size_t)count, sizeof *spent);
  int peer = connectEach ? -1 : connected(path);
  for (int i = 0; i < count; ++i) {
    char reply[65536];
    const long long begin = now();
    if (connectEach) peer = connected(path);
    check(send(peer, request, size, MSG_NOSIGNAL) == (ssize_t)size, "send");
    check(recv(peer, reply, sizeof reply, 0) > 0, "recv");
    spent[i] = now() - begin;
    if (connectEach) close(peer);
  }
  for (int i = 0; i < count; ++i) printf("%lld\n", spent[i]);
  free(spent);
}

int main(int argc, char** argv) {
  if (argc == 3 && strcmp(argv[1], "serve") == 0) {
    serve(argv[2]);
  } else if (argc == 5 && (strcmp(argv[1], "ask") == 0 || strcmp(argv[1], "connect") == 0)) {
    ask(argv[2], atoi(argv[3]), argv[4], argv[1][0] == 'c');
  } else {
    fprintf(stderr, "usage: roundtrip serve PATH | ask|connect PATH COUNT LINE\n");
    return 64;
  }
  return 0;
}

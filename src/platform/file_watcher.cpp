// Classifies what happened to a watched file.
#include "platform/file_watcher.h"

#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>

#include "platform/paths.h"

namespace lmx {
namespace {

constexpr std::uint32_t kFileHints = IN_MODIFY | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF;
constexpr std::uint32_t kDirectoryHints = IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_ONLYDIR;

long long nanoseconds(const timespec& time) { return time.tv_sec * 1000000000LL + time.tv_nsec; }

/// Reads all pending events. @return whether there were any; sets `modified` when one of them is a write
bool readHints(int inotify, bool& modified) {
  alignas(inotify_event) char buffer[4096];
  bool any = false;
  for (;;) {
    const ssize_t size = read(inotify, buffer, sizeof buffer);
    if (size <= 0) return any;
    any = true;
    for (const char* at = buffer; at < buffer + size;) {
      const auto* event = reinterpret_cast<const inotify_event*>(at);
      if ((event->mask & IN_MODIFY) != 0) modified = true;
      at += sizeof *event + event->len;
    }
  }
}

}  // namespace

FileWatcher::FileWatcher() = default;

bool FileWatcher::open(const std::string& path) {
  path_ = path;
  // A file replaced between open and watch would raise no further events. Then try again.
  for (int attempt = 0; attempt < 3; ++attempt) {
    close();
    file_.reset(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!file_.valid()) return false;
    watch();
    if (!classify(false).deleted) return true;
  }
  inotify_.reset();  // it keeps changing: check the file itself at every poll
  return true;
}

void FileWatcher::close() {
  file_.reset();
  inotify_.reset();
}

void FileWatcher::watch() {
  inotify_.reset(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (!inotify_.valid()) return;
  // Watch by descriptor: the path may already name another file.
  const std::string self = "/proc/self/fd/" + std::to_string(file_.get());
  const int watched = inotify_add_watch(inotify_.get(), self.c_str(), kFileHints);
  // Replacing a symbolic link raises no event on its target, so watch the link's directory as well.
  const int directory = inotify_add_watch(inotify_.get(), directoryOf(path_).c_str(), kDirectoryHints);
  if (watched < 0 || directory < 0) inotify_.reset();  // without inotify every poll checks the file itself
}

FileEvents FileWatcher::poll() {
  if (!file_.valid()) return {};
  bool modified = false;
  if (inotify_.valid() && !readHints(inotify_.get(), modified)) return {};
  return classify(modified);
}

FileEvents FileWatcher::classify(bool modified) {
  FileEvents events;
  struct stat held {};
  struct stat named {};
  const bool there = fstat(file_.get(), &held) == 0 && stat(path_.c_str(), &named) == 0;
  if (!there || held.st_nlink == 0 || named.st_ino != held.st_ino || named.st_dev != held.st_dev) {
    events.deleted = true;
    return events;
  }
  const long long written_ns = nanoseconds(held.st_mtim);
  const long long changed_ns = nanoseconds(held.st_ctim);
  events.extended = held.st_size > size_;
  // File timestamps tick in milliseconds. Of two writes within one tick, only the event reveals the second.
  events.written = modified || held.st_size != size_ || written_ns != modified_ns_;
  events.attributes = !events.written && changed_ns != changed_ns_;
  size_ = held.st_size;
  modified_ns_ = written_ns;
  changed_ns_ = changed_ns;
  return events;
}

}  // namespace lmx

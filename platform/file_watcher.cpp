// Classifying what happened to a file.
#include "platform/file_watcher.h"

#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace lmx {
namespace {

long long nanoseconds(const timespec& time) { return time.tv_sec * 1000000000LL + time.tv_nsec; }

}  // namespace

FileWatcher::FileWatcher() = default;

bool FileWatcher::open(const std::string& path) {
  close();
  path_ = path;
  file_.reset(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file_.valid()) return false;
  inotify_.reset(inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  // By the descriptor's own name: the path may name another file by now.
  const std::string self = "/proc/self/fd/" + std::to_string(file_.get());
  const std::uint32_t mask = IN_MODIFY | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF | IN_CLOSE_WRITE;
  if (inotify_.valid() && inotify_add_watch(inotify_.get(), self.c_str(), mask) < 0 &&
      inotify_add_watch(inotify_.get(), path.c_str(), mask) < 0) {
    inotify_.reset();  // without hints every poll looks at the state itself
  }
  struct stat now {};
  fstat(file_.get(), &now);
  size_ = now.st_size;
  modified_ns_ = nanoseconds(now.st_mtim);
  changed_ns_ = nanoseconds(now.st_ctim);
  return true;
}

void FileWatcher::close() {
  file_.reset();
  inotify_.reset();
}

FileEvents FileWatcher::poll() {
  if (!file_.valid()) return {};
  if (inotify_.valid()) {
    alignas(inotify_event) char buffer[4096];
    bool hint = false;
    while (read(inotify_.get(), buffer, sizeof buffer) > 0) hint = true;
    if (!hint) return {};
  }
  return classify();
}

FileEvents FileWatcher::classify() {
  FileEvents events;
  struct stat held {};
  struct stat named {};
  fstat(file_.get(), &held);
  const bool there = stat(path_.c_str(), &named) == 0;
  if (held.st_nlink == 0 || !there || named.st_ino != held.st_ino || named.st_dev != held.st_dev) {
    events.deleted = true;
    return events;
  }
  const long long modified = nanoseconds(held.st_mtim);
  const long long changed = nanoseconds(held.st_ctim);
  events.extended = held.st_size > size_;
  events.written = held.st_size != size_ || modified != modified_ns_;
  events.attributes = !events.written && changed != changed_ns_;
  size_ = held.st_size;
  modified_ns_ = modified;
  changed_ns_ = changed;
  return events;
}

}  // namespace lmx

// Watches one file through its replacements: what happened to it since the last look?
#pragma once
#include <string>

#include "support/unique_fd.h"

namespace lmx {

/// What poll() saw; several may be set.
struct FileEvents {
  bool deleted = false;   ///< the watched file left its name (unlinked, or another file was renamed over it)
  bool written = false;   ///< contents changed in place
  bool extended = false;  ///< grew in place
  bool attributes = false;  ///< mode, owner or times only
  [[nodiscard]] bool any() const { return deleted || written || extended || attributes; }
};

/// One thread only. inotify events are hints that something happened; what happened is read from the state:
/// the descriptor held open keeps the inode from being reused, so "same inode" is certain.
class FileWatcher {
 public:
  FileWatcher();

  /// Opens `path` and watches what it names now. @return false when it can't be opened (then isOpen() is
  /// false).
  bool open(const std::string& path);
  void close();
  [[nodiscard]] bool isOpen() const { return file_.valid(); }

  /// What has happened since open() or the last poll(). Never blocks; a poll with nothing pending costs one
  /// read. After `deleted` the watch is spent: close() or open() again.
  FileEvents poll();

 private:
  void watch();
  /// Compares with the last look; `modified`: a hint of a write was among the events.
  FileEvents classify(bool modified);
  std::string path_;
  UniqueFd file_;
  UniqueFd inotify_;
  // State of the file at the last look, to tell a write from a change of attributes.
  long long size_ = 0;
  long long modified_ns_ = 0;
  long long changed_ns_ = 0;
};

}  // namespace lmx

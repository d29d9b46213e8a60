// Watches one file, and notices when it is replaced.
#pragma once
#include <string>

#include "support/unique_fd.h"

namespace lmx {

/// What poll() found. Several may be set.
struct FileEvents {
  bool deleted = false;   ///< the path no longer names the watched file (it was unlinked, or another file was
                          ///< renamed over it)
  bool written = false;   ///< contents changed in place
  bool extended = false;  ///< grew in place
  bool attributes = false;  ///< mode, owner or times only
  [[nodiscard]] bool any() const { return deleted || written || extended || attributes; }
};

/// For use on one thread only. inotify events are only hints: poll() compares the file's state with the last
/// one it saw. The open descriptor keeps the inode from being reused, so an equal inode number means the same
/// file.
class FileWatcher {
 public:
  FileWatcher();

  /// Opens `path` and watches the file it names now.
  /// @return false when it can't be opened (isOpen() is then false)
  bool open(const std::string& path);
  void close();
  [[nodiscard]] bool isOpen() const { return file_.valid(); }

  /// What has happened since open() or the last poll(). Never blocks; costs one read when nothing is pending.
  /// After `deleted` the watch is void: call close() or open().
  FileEvents poll();

 private:
  void watch();
  /// Compares the file with its last known state. `modified`: a write event was pending.
  FileEvents classify(bool modified);
  std::string path_;
  UniqueFd file_;
  UniqueFd inotify_;
  // State of the file at the last poll, to tell a write from a change of attributes.
  long long size_ = 0;
  long long modified_ns_ = 0;
  long long changed_ns_ = 0;
};

}  // namespace lmx

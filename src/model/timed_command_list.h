// The commands that a server has scheduled for later.
#pragma once
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "support/dictionary.h"

namespace lmx {

/// Entries are in the order in which they were scheduled. An entry is the complete, immutable parameter
/// dictionary of its TIMEDCMD, including "TimerID". Thread-safe.
class TimedCommandList {
 public:
  using Entry = SharedDictionary;

  /// @return false when `unlessKnown` is set and there is an entry with the same TimerID
  bool append(Entry entry, bool unlessKnown = false);
  /// Removes the first entry with this "TimerID". @return false when there is none
  bool removeTimer(const std::string& timerID);
  /// Removes `entry` itself. @return whether the list held an entry equal to it
  bool takeIfListed(const Entry& entry);
  [[nodiscard]] std::vector<Entry> entries() const;
  /// Calls `write` with the current entries. Calls are serialised, so that of two changes the later one is
  /// written last.
  /// @return the result of `write`
  bool persist(const std::function<bool(const std::vector<Entry>&)>& write);

 private:
  mutable std::mutex mutex_;
  std::vector<Entry> entries_;  // guarded by mutex_
  std::mutex write_mutex_;      // held during persist; lock it before mutex_
};

}  // namespace lmx

// The commands that a server wants run later.
#pragma once
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "support/dictionary.h"

namespace lmx {

/// Entries in the order in which they were scheduled. An entry is the whole parameter dictionary of its
/// TIMEDCMD, "TimerID" included, and never changes. Thread-safe.
class TimedCommandList {
 public:
  using Entry = SharedDictionary;

  /// @return false when an entry of the same TimerID is there and `unlessKnown` is set
  bool append(Entry entry, bool unlessKnown = false);
  /// Removes the first entry with that "TimerID". @return false when there is none
  bool removeTimer(const std::string& timerID);
  /// Takes `entry` itself out when the list holds one equal to it. @return false when it holds none
  bool takeIfListed(const Entry& entry);
  [[nodiscard]] std::vector<Entry> entries() const;
  /// Calls `write` with the entries as they are. Calls come one after another, so that of two changes the
  /// later one is written last. @return what it returns
  bool persist(const std::function<bool(const std::vector<Entry>&)>& write);

 private:
  mutable std::mutex mutex_;
  std::vector<Entry> entries_;  // guarded by mutex_
  std::mutex write_mutex_;      // held during persist; taken before mutex_
};

}  // namespace lmx

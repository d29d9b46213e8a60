// Timed commands that are not yet due.
#pragma once
#include <ctime>
#include <mutex>
#include <optional>
#include <vector>

#include "model/agent_actions.h"

namespace lmx {

/// Compares dates with the wall clock at each check instead of counting down, so that a command runs at its
/// date even when the clock is set. Thread-safe.
class Schedule {
 public:
  struct Command {
    SharedDictionary entry;
    std::time_t date = 0;  ///< seconds since 1970
    ChannelKind channel = ChannelKind::detached;
  };

  void add(Command command);
  /// Takes the earliest command, if its date is not after `now`. At equal dates what ends a recording (STOP,
  /// CANCEL) comes first: a lecture begins in the second in which the one before it ends, whichever was
  /// scheduled first. Otherwise equal dates keep the order in which they were added.
  std::optional<Command> takeDue(std::time_t now);
  /// The earliest date; absent when there are no commands.
  [[nodiscard]] std::optional<std::time_t> next() const;

 private:
  mutable std::mutex mutex_;
  std::vector<Command> commands_;  // guarded by mutex_; sorted by date
};

}  // namespace lmx

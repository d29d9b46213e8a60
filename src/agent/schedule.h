// Timed commands waiting for their moment.
#pragma once
#include <ctime>
#include <mutex>
#include <optional>
#include <vector>

#include "model/agent_actions.h"

namespace lmx {

/// Compares with the wall clock at each look instead of counting down: after the clock has been set, a
/// command still runs at the time it was given. Thread-safe.
class Schedule {
 public:
  struct Command {
    SharedDictionary entry;
    std::time_t date = 0;  ///< seconds since 1970
    ChannelKind channel = ChannelKind::detached;
  };

  void add(Command command);
  /// Takes the commands whose date is not after `now`, the earliest first, equal ones in the order of adding.
  std::vector<Command> takeDue(std::time_t now);
  /// The earliest date; absent when nothing waits.
  [[nodiscard]] std::optional<std::time_t> next() const;

 private:
  mutable std::mutex mutex_;
  std::vector<Command> commands_;  // guarded by mutex_; sorted by date
};

}  // namespace lmx

// Runs timed commands when they are due.
#pragma once
#include <chrono>
#include <ctime>

#include "agent/channels.h"
#include "agent/schedule.h"
#include "model/agent_actions.h"
#include "model/agent_log.h"
#include "platform/run_loop.h"

namespace lmx {

/// Main thread only, except scheduleTimedCommand.
class TimedCommandRunner {
 public:
  /// All arguments outlive the object.
  TimedCommandRunner(const AgentLog& log, Channels& channels, RunLoop& loop)
      : log_(log), channels_(channels), loop_(loop) {}

  /// Schedules `entry` to run at `date` (seconds since 1970, wall clock) on the channel of that kind. Any
  /// thread.
  void scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel);
  /// Schedules the commands that an earlier process left in the timers file.
  void loadSchedule();
  /// Runs the commands whose date is not after `now` (seconds since 1970).
  void runDueCommands(std::time_t now);
  /// How long the loop may sleep without missing a command.
  [[nodiscard]] std::chrono::milliseconds timeToNextCommand(std::chrono::milliseconds atMost) const;

 private:
  const AgentLog& log_;
  Channels& channels_;
  RunLoop& loop_;
  Schedule schedule_;
};

}  // namespace lmx

// Runs timed commands when they are due.
#pragma once
#include <chrono>
#include <ctime>

#include "agent/channels.h"
#include "agent/schedule.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "platform/run_loop.h"

namespace lmx {

/// Main thread only, except scheduleTimedCommand.
class TimedCommandRunner {
 public:
  /// All arguments outlive the object.
  TimedCommandRunner(const AgentContext& context, Channels& channels, RunLoop& loop)
      : context_(context), channels_(channels), loop_(loop) {}

  /// Schedules `entry` to run at `date` (seconds since 1970, wall clock) on the channel of that kind. Any
  /// thread.
  void scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel);
  /// Schedules the commands that an earlier process left in the timers file.
  void loadSchedule();
  /// Posts the earliest command if its date is not after `now` (seconds since 1970), unless one is posted
  /// already. So what has been asked for before runs before it, and what it asks for before the next: a STOP
  /// and the START of the next lecture may be due together.
  void postDueCommand(std::time_t now);
  /// How long the loop may sleep without missing a command.
  [[nodiscard]] std::chrono::milliseconds timeToNextCommand(std::chrono::milliseconds atMost) const;

 private:
  void run(const Schedule::Command& command);

  const AgentContext& context_;
  Channels& channels_;
  RunLoop& loop_;
  Schedule schedule_;
  bool posted_ = false;  ///< main thread
};

}  // namespace lmx

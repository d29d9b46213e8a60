// Schedules timed commands and runs them from the main loop.
#include "agent/timed_command_runner.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "support/time_value.h"

namespace lmx {

void TimedCommandRunner::scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) {
  schedule_.add({std::move(entry), date, channel});
  loop_.post([] {}, Wait::no);  // wake the loop, which may be sleeping past that date
}

void TimedCommandRunner::loadSchedule() { channels_.channelOf(ChannelKind::tunnel).loadTimedCommands(); }

void TimedCommandRunner::postDueCommand(std::time_t now) {
  if (posted_) return;
  auto due = schedule_.takeDue(now);
  if (!due) return;
  posted_ = loop_.post([this, command = *std::move(due)] { run(command); }, Wait::no);
}

void TimedCommandRunner::run(const Schedule::Command& command) {
  posted_ = false;
  // An agent that is ending would refuse it. It stays in the timers file.
  if (!context_.state.running.get()) return;
  try {
    channels_.channelOf(command.channel).completeTimedCommand(command.entry);
  } catch (const std::exception& problem) {  // the remaining commands must still run
    LMPLogMessage(context_.log_context(), kLogCritical, "A timed command failed: %s", problem.what());
  }
}

std::chrono::milliseconds TimedCommandRunner::timeToNextCommand(std::chrono::milliseconds atMost) const {
  const auto next = schedule_.next();
  const auto now = lmp_gettimeofday();
  if (!next || !now) return atMost;
  return std::clamp(std::chrono::milliseconds(lmp_diff_timeval({*next, 0}, *now) + 1),
                    std::chrono::milliseconds(0), atMost);
}

}  // namespace lmx

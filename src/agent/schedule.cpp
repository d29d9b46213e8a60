// Commands sorted by their date, and the turn of the main loop that runs them.
#include "agent/schedule.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "agent/agent_main.h"

namespace lmx {
namespace {

bool earlier(std::time_t date, const Schedule::Command& command) { return date < command.date; }

}  // namespace

void Schedule::add(Command command) {
  const std::lock_guard lock(mutex_);
  const auto place = std::upper_bound(commands_.begin(), commands_.end(), command.date, earlier);
  commands_.insert(place, std::move(command));
}

std::vector<Schedule::Command> Schedule::takeDue(std::time_t now) {
  const std::lock_guard lock(mutex_);
  const auto end = std::upper_bound(commands_.begin(), commands_.end(), now, earlier);
  std::vector<Command> due(std::make_move_iterator(commands_.begin()), std::make_move_iterator(end));
  commands_.erase(commands_.begin(), end);
  return due;
}

std::optional<std::time_t> Schedule::next() const {
  const std::lock_guard lock(mutex_);
  if (commands_.empty()) return std::nullopt;
  return commands_.front().date;
}

void AgentMain::scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) {
  schedule_.add({std::move(entry), date, channel});
  loop_.post([] {}, Wait::no);  // the loop may be asleep past that date
}

void AgentMain::loadSchedule() { channelOf(ChannelKind::tunnel).loadTimedCommands(); }

void AgentMain::runDueCommands(std::time_t now) {
  for (const Schedule::Command& command : schedule_.takeDue(now)) {
    try {
      channelOf(command.channel).completeTimedCommand(command.entry);
    } catch (const std::exception& problem) {  // the commands behind it are still to run
      LMPLogMessage(context_->log_context(), kLogCritical, "A timed command failed: %s", problem.what());
    }
  }
}

std::chrono::milliseconds AgentMain::timeToNextCommand(std::chrono::milliseconds atMost) const {
  const auto next = schedule_.next();
  const auto now = lmp_gettimeofday();
  if (!next || !now) return atMost;
  const TimeValue date{*next, 0};
  return std::clamp(std::chrono::milliseconds(lmp_diff_timeval(date, *now) + 1), std::chrono::milliseconds(0),
                    atMost);
}

AgentControlBase& AgentMain::channelOf(ChannelKind kind) {
  if (kind == ChannelKind::tunnel && agentControl_) return *agentControl_;
  if (kind == ChannelKind::local && agentControlLocal_) return *agentControlLocal_;
  return detached_;
}

}  // namespace lmx

// Keeps commands sorted by date.
#include "agent/schedule.h"

#include <algorithm>
#include <utility>

namespace lmx {
namespace {

bool endsRecording(const Schedule::Command& command) {
  const auto verb = lookUp(command.entry, "command");
  return verb == "STOP" || verb == "CANCEL";
}

bool earlier(const Schedule::Command& a, const Schedule::Command& b) {
  return a.date != b.date ? a.date < b.date : endsRecording(a) && !endsRecording(b);
}

}  // namespace

void Schedule::add(Command command) {
  const std::lock_guard lock(mutex_);
  const auto place = std::upper_bound(commands_.begin(), commands_.end(), command, earlier);
  commands_.insert(place, std::move(command));
}

std::optional<Schedule::Command> Schedule::takeDue(std::time_t now) {
  const std::lock_guard lock(mutex_);
  if (commands_.empty() || commands_.front().date > now) return std::nullopt;
  Command due = std::move(commands_.front());
  commands_.erase(commands_.begin());
  return due;
}

std::optional<std::time_t> Schedule::next() const {
  const std::lock_guard lock(mutex_);
  if (commands_.empty()) return std::nullopt;
  return commands_.front().date;
}

}  // namespace lmx

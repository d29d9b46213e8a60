// Keeps commands sorted by date.
#include "agent/schedule.h"

#include <algorithm>
#include <iterator>
#include <utility>

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

}  // namespace lmx

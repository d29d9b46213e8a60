// The list of timed commands.
#include "model/timed_command_list.h"

#include <algorithm>
#include <utility>

namespace lmx {
namespace {

auto withTimer(const std::string& timerID) {
  return [&timerID](const TimedCommandList::Entry& entry) { return lookUp(entry, "TimerID") == timerID; };
}

}  // namespace

bool TimedCommandList::append(Entry entry, bool unlessKnown) {
  const std::lock_guard lock(mutex_);
  const auto timerID = lookUp(entry, "TimerID");
  if (unlessKnown && timerID && std::any_of(entries_.begin(), entries_.end(), withTimer(*timerID)))
    return false;
  entries_.push_back(std::move(entry));
  return true;
}

bool TimedCommandList::removeTimer(const std::string& timerID) {
  const std::lock_guard lock(mutex_);
  const auto found = std::find_if(entries_.begin(), entries_.end(), withTimer(timerID));
  if (found == entries_.end()) return false;
  entries_.erase(found);
  return true;
}

bool TimedCommandList::takeIfListed(const Entry& entry) {
  const std::lock_guard lock(mutex_);
  const bool listed =
      std::any_of(entries_.begin(), entries_.end(), [&](const Entry& other) { return *other == *entry; });
  entries_.erase(std::remove(entries_.begin(), entries_.end(), entry), entries_.end());
  return listed;
}

std::vector<TimedCommandList::Entry> TimedCommandList::entries() const {
  const std::lock_guard lock(mutex_);
  return entries_;
}

bool TimedCommandList::persist(const std::function<bool(const std::vector<Entry>&)>& write) {
  const std::lock_guard lock(write_mutex_);
  return write(entries());
}

}  // namespace lmx

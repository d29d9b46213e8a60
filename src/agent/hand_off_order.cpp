// Holds ready jobs back until those of older recordings are in the list.
#include "agent/hand_off_order.h"

#include <map>
#include <mutex>
#include <utility>

namespace lmx {

struct HandOffOrder::State {
  struct Place {
    bool settled = false;
    Jobs jobs;
    Clock::time_point since{};  ///< when it was settled
  };

  explicit State(PostProcessList& jobList) : list(jobList) {}

  void settle(std::uint64_t place, Jobs jobs, Clock::time_point now) {
    const std::lock_guard lock(mutex);
    places[place] = {.settled = true, .jobs = std::move(jobs), .since = now};
    while (!places.empty() && places.begin()->second.settled) pass(places.begin());
  }
  /// In the list before it leaves here: it is never in neither. Call it with the lock held.
  void pass(std::map<std::uint64_t, Place>::iterator place) {
    for (auto& job : place->second.jobs) list.postProcessListAddJob(std::move(job));
    places.erase(place);
  }

  PostProcessList& list;
  mutable std::mutex mutex;
  std::map<std::uint64_t, Place> places;  // guarded by mutex, as is the next
  std::uint64_t last = 0;
};

class HandOffOrder::Ticket {
 public:
  Ticket(std::shared_ptr<State> state, std::uint64_t place) : state_(std::move(state)), place_(place) {}
  ~Ticket() {
    if (!delivered_) state_->settle(place_, {}, Clock::now());
  }
  Ticket(const Ticket&) = delete;
  Ticket& operator=(const Ticket&) = delete;

  [[nodiscard]] std::uint64_t place() const { return place_; }
  void deliver(Jobs jobs, Clock::time_point now) {
    delivered_ = true;
    state_->settle(place_, std::move(jobs), now);
  }

 private:
  const std::shared_ptr<State> state_;
  const std::uint64_t place_;
  bool delivered_ = false;
};

HandOffOrder::HandOffOrder(PostProcessList& list) : state_(std::make_shared<State>(list)) {}

std::shared_ptr<HandOffOrder::Ticket> HandOffOrder::enter() {
  const std::lock_guard lock(state_->mutex);
  const std::uint64_t place = ++state_->last;
  state_->places.emplace(place, State::Place{});
  return std::make_shared<Ticket>(state_, place);
}

std::uint64_t HandOffOrder::placeOf(const Ticket& ticket) { return ticket.place(); }

void HandOffOrder::deliver(Ticket& ticket, Jobs jobs, Clock::time_point now) {
  ticket.deliver(std::move(jobs), now);
}

void HandOffOrder::letOverduePass(Clock::time_point now) {
  const std::lock_guard lock(state_->mutex);
  auto& places = state_->places;
  for (auto place = places.begin(); place != places.end();) {
    const auto current = place++;
    if (current->second.settled && now - current->second.since >= kPatience) state_->pass(current);
  }
}

bool HandOffOrder::underWay() const {
  const std::lock_guard lock(state_->mutex);
  return !state_->places.empty();
}

}  // namespace lmx

// Brings jobs into the list in the order in which their recordings were stopped.
#pragma once
#include <chrono>
#include <cstdint>
#include <memory>
#include <vector>

#include "model/post_process_list.h"

namespace lmx {

/// Movies are made in parallel, and a short one is ready before the long one that was stopped earlier. A
/// recording has a ticket from its stop until its jobs are delivered or it turns out to have none.
/// Thread-safe.
class HandOffOrder {
 public:
  using Jobs = std::vector<std::shared_ptr<AgentSubmit>>;
  using Clock = std::chrono::steady_clock;
  /// For so long ready jobs wait for an older recording.
  static constexpr std::chrono::seconds kPatience{60};

  /// @param list  outlives all tickets
  explicit HandOffOrder(PostProcessList& list);

  /// Whoever drops it without delivering has no job.
  class Ticket;
  /// The place behind all recordings stopped so far.
  [[nodiscard]] std::shared_ptr<Ticket> enter();
  /// The number of the ticket's place.
  static std::uint64_t placeOf(const Ticket& ticket);
  /// The jobs go into the list once all older tickets are settled. Call it once a ticket.
  static void deliver(Ticket& ticket, Jobs jobs, Clock::time_point now = Clock::now());
  /// Jobs that have waited too long for an older recording go ahead. To be called now and then.
  void letOverduePass(Clock::time_point now);
  /// Whether any ticket is not settled, or jobs wait here.
  [[nodiscard]] bool underWay() const;

 private:
  struct State;
  const std::shared_ptr<State> state_;
};

}  // namespace lmx

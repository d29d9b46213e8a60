// The thread that takes finished recordings to the server, oldest first, one at a time.
#pragma once
#include <memory>

#include "agent/context/agent_context.h"
#include "platform/child_process.h"

namespace lmx {

/// Its thread is not joined: a submission may take hours, the end of the process does not wait for it.
class PostProcessScheduler {
 public:
  PostProcessScheduler();
  ~PostProcessScheduler();
  PostProcessScheduler(const PostProcessScheduler&) = delete;
  PostProcessScheduler& operator=(const PostProcessScheduler&) = delete;

  /// @param children  lives until the process ends
  /// @return false when the thread can't be made.
  bool start(std::shared_ptr<AgentContext> context, ChildRunner& children);
  /// Asks the thread to end after the job in hand; an idle one ends at once. Thread-safe.
  void cancel();
  /// Whether a job is being taken or run. Thread-safe.
  [[nodiscard]] bool busy() const;

 private:
  struct State;
  static int agentPostProcessSchedulerRunLoop(const std::shared_ptr<State>& state);
  std::shared_ptr<State> state_;
};

}  // namespace lmx

// The thread that submits finished recordings to the server, oldest first, one at a time.
#pragma once
#include <chrono>
#include <functional>
#include <memory>

#include "model/agent_context.h"
#include "platform/child_process.h"

namespace lmx {

/// What the loop needs from its owner. All three must be set. They are called on the loop's thread.
struct SchedulerHooks {
  std::function<void(std::chrono::milliseconds)> sleep;  ///< waits at most this long between checks
  std::function<bool()> cancelled;                       ///< true: end, even with jobs in the list
  std::function<void(bool)> setBusy;                     ///< whether a job is being taken or run
};

/// The body of the thread: takes jobs off the context's list and runs them while the context is `running`.
/// Checks again at once after a job, and within five seconds when the list was empty. Jobs left at the end
/// stay in the list; their files are on disk. @return 0
int agentPostProcessSchedulerRunLoop(AgentContext& context, ChildRunner& children,
                                     const SchedulerHooks& hooks);

/// The thread is not joined: a submission may take hours, and the process does not wait for it to exit.
class PostProcessScheduler {
 public:
  PostProcessScheduler();
  ~PostProcessScheduler();
  PostProcessScheduler(const PostProcessScheduler&) = delete;
  PostProcessScheduler& operator=(const PostProcessScheduler&) = delete;

  /// Call once.
  /// @param children  lives until the process ends
  /// @return false when the thread can't be created
  bool start(std::shared_ptr<AgentContext> context, ChildRunner& children);
  /// Asks the thread to end after the current job; an idle thread ends at once. Thread-safe.
  void cancel();
  /// Whether a job is being taken or run. Thread-safe.
  [[nodiscard]] bool busy() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace lmx

// The thread that takes finished recordings to the server, oldest first, one at a time.
#pragma once
#include <chrono>
#include <functional>
#include <memory>

#include "model/agent_context.h"
#include "platform/child_process.h"

namespace lmx {

/// What the loop needs of whoever runs it. All three are set; they are called on the loop's thread.
struct SchedulerHooks {
  std::function<void(std::chrono::milliseconds)> sleep;  ///< waits at most that long between two empty looks
  std::function<bool()> cancelled;                       ///< true: end, even with jobs in the list
  std::function<void(bool)> setBusy;                     ///< whether a job is being taken or run
};

/// The thread's body: takes jobs off the context's list and runs them while it is `running`; looks again at
/// once after a job, after at most five seconds when there was none. Jobs still in the list at the end stay
/// there: their files are on the disk. @return 0
int agentPostProcessSchedulerRunLoop(AgentContext& context, ChildRunner& children,
                                     const SchedulerHooks& hooks);

/// Its thread is not joined: a submission may take hours, the end of the process does not wait for it.
class PostProcessScheduler {
 public:
  PostProcessScheduler();
  ~PostProcessScheduler();
  PostProcessScheduler(const PostProcessScheduler&) = delete;
  PostProcessScheduler& operator=(const PostProcessScheduler&) = delete;

  /// Call it once.
  /// @param children  lives until the process ends
  /// @return false when the thread can't be made.
  bool start(std::shared_ptr<AgentContext> context, ChildRunner& children);
  /// Asks the thread to end after the job in hand; an idle one ends at once. Thread-safe.
  void cancel();
  /// Whether a job is being taken or run. Thread-safe.
  [[nodiscard]] bool busy() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace lmx

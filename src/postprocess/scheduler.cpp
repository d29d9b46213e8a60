// The scheduler's loop and its thread.
#include "postprocess/scheduler.h"

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <system_error>
#include <thread>

#include "postprocess/agent_submit.h"

namespace lmx {

using namespace std::chrono_literals;

int agentPostProcessSchedulerRunLoop(AgentContext& context, ChildRunner& children,
                                     const SchedulerHooks& hooks) {
  context.logInfo("Post-Process Scheduler starts");
  while (context.state.running.get() && !hooks.cancelled()) {
    hooks.setBusy(true);  // set before taking the job, so that it is never neither listed nor busy
    if (const auto job = context.post_process_list.postProcessListNext()) {
      job->addRecordingWithCommentary(children);  // logs its own failures, which don't affect the next job
      continue;
    }
    hooks.setBusy(false);
    hooks.sleep(5s);
  }
  hooks.setBusy(false);
  context.logInfo("Post-Process Scheduler stopped");
  return 0;
}

/// Shared by the scheduler and its thread; the last of them destroys it.
struct PostProcessScheduler::State {
  std::mutex mutex;
  std::condition_variable changed;
  bool cancelled = false;  // guarded by mutex
  std::atomic<bool> busy{false};

  void sleep(std::chrono::milliseconds time) {
    std::unique_lock lock(mutex);
    changed.wait_for(lock, time, [this] { return cancelled; });
  }
  bool isCancelled() {
    const std::lock_guard lock(mutex);
    return cancelled;
  }
};

PostProcessScheduler::PostProcessScheduler() : state_(std::make_shared<State>()) {}
PostProcessScheduler::~PostProcessScheduler() { cancel(); }

bool PostProcessScheduler::start(std::shared_ptr<AgentContext> context, ChildRunner& children) {
  const auto body = [state = state_, context = std::move(context), &children] {
    agentPostProcessSchedulerRunLoop(*context, children,
                                     {.sleep = [&state](auto time) { state->sleep(time); },
                                      .cancelled = [&state] { return state->isCancelled(); },
                                      .setBusy = [&state](bool busy) { state->busy = busy; }});
  };
  try {
    std::thread(body).detach();
  } catch (const std::system_error&) {
    return false;
  }
  return true;
}

void PostProcessScheduler::cancel() {
  const std::lock_guard lock(state_->mutex);
  state_->cancelled = true;
  state_->changed.notify_all();
}

bool PostProcessScheduler::busy() const { return state_->busy; }

}  // namespace lmx

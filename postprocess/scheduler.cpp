// The scheduler thread.
#include "postprocess/scheduler.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <system_error>
#include <thread>

#include "postprocess/agent_submit.h"

namespace lmx {

using namespace std::chrono_literals;

struct PostProcessScheduler::State {
  std::shared_ptr<AgentContext> context;
  ChildRunner* children = nullptr;
  std::mutex mutex;
  std::condition_variable changed;
  bool cancelled = false;  // guarded by mutex
  std::atomic<bool> busy{false};

  bool wait(std::chrono::milliseconds time) {
    std::unique_lock lock(mutex);
    return !changed.wait_for(lock, time, [this] { return cancelled; });
  }
};

PostProcessScheduler::PostProcessScheduler() : state_(std::make_shared<State>()) {}
PostProcessScheduler::~PostProcessScheduler() { cancel(); }

bool PostProcessScheduler::start(std::shared_ptr<AgentContext> context, ChildRunner& children) {
  state_->context = std::move(context);
  state_->children = &children;
  try {
    std::thread([state = state_] { agentPostProcessSchedulerRunLoop(state); }).detach();
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

int PostProcessScheduler::agentPostProcessSchedulerRunLoop(const std::shared_ptr<State>& state) {
  AgentContext& context = *state->context;
  context.logInfo("Post-Process Scheduler starts");
  while (context.running()) {
    state->busy = true;  // before the list is empty: between list and thread a job must not be overlooked
    if (const auto job = context.postProcessListNext()) {
      job->addRecordingWithCommentary(*state->children);
      continue;
    }
    state->busy = false;
    if (!state->wait(5s)) break;
  }
  state->busy = false;
  context.logInfo("Post-Process Scheduler stopped");
  return 0;
}

}  // namespace lmx

// The shared record's queue, its cluster information and its end.
#include "model/agent_context.h"

#include <mutex>
#include <utility>

namespace lmx {

AgentContext::~AgentContext() { cleanup(); }

void AgentContext::logDebug(const std::string& message) const {
  LMPLogMessage(log_context(), kLogDebug, "%s", message.c_str());
}
void AgentContext::logInfo(const std::string& message) const {
  LMPLogMessage(log_context(), kLogInfo, "%s", message.c_str());
}
void AgentContext::logWarn(const std::string& message) const {
  LMPLogMessage(log_context(), kLogWarning, "%s", message.c_str());
}

void AgentContext::postProcessListAddJob(std::shared_ptr<AgentSubmit> job) {
  const std::lock_guard lock(post_process_list_mutex_);
  post_process_list_.push_back(std::move(job));
}

std::shared_ptr<AgentSubmit> AgentContext::postProcessListNext() {
  const std::lock_guard lock(post_process_list_mutex_);
  if (post_process_list_.empty()) return nullptr;
  auto job = std::move(post_process_list_.front());
  post_process_list_.pop_front();
  return job;
}

std::size_t AgentContext::postProcessListCount() {
  const std::lock_guard lock(post_process_list_mutex_);
  return post_process_list_.size();
}

void AgentContext::setServer_info(SharedPlist info) {
  const std::lock_guard lock(server_info_mutex_);
  std::swap(server_info_, info);
}

AgentContext::SharedPlist AgentContext::server_info_retain() {
  const std::lock_guard lock(server_info_mutex_);
  return server_info_;
}

void AgentContext::setCleanupHooks(std::function<void()> releaseTunnel,
                                   std::function<bool()> cancelPostProcess) {
  release_tunnel_ = std::move(releaseTunnel);
  cancel_post_process_ = std::move(cancelPostProcess);
}

void AgentContext::cleanup() {
  if (cleaned_up_.exchange(true)) return;
  setRunning(false);
  if (!adhoc() && release_tunnel_) release_tunnel_();
  setRecord_context(nullptr);
  if (cancel_post_process_ && cancel_post_process_()) logInfo("Stopping post-process thread...");
  {
    const std::lock_guard lock(post_process_list_mutex_);
    post_process_list_.clear();
  }
  setLaunch_time(std::nullopt);
  LMPLogDestroyContext(log_context_.exchange(nullptr));
  setServer_info(nullptr);
  setContinuous(std::nullopt);
}

}  // namespace lmx

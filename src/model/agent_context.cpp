// Takes the shared agent context apart at the end.
#include "model/agent_context.h"

namespace lmx {

AgentContext::~AgentContext() { cleanup(); }

void AgentContext::cleanup() {
  if (cleaned_up_.exchange(true)) return;
  state.running.set(false);
  releaseRecord();
  post_process_list.clear();
  state.launch_time.set(std::nullopt);
  open(nullptr);
  server_info.set(nullptr);
  recording.continuous.set(std::nullopt);
}

void AgentContext::releaseRecord() {
  recording_settings_.set(nullptr);
  record_context_.set(nullptr);
}

}  // namespace lmx

// Counts the users of each pipeline.
#include "capture/source/pipeline_registry.h"

namespace lmx {

PipelineRegistry& PipelineRegistry::instance() {
  static auto* registry = new PipelineRegistry;
  return *registry;
}

Result<PipelineLease, CaptureError> PipelineRegistry::acquire(const CaptureSource& source) {
  const std::string key = source.key();
  const std::lock_guard lock(mutex_);
  auto found = open_.find(key);
  if (found != open_.end()) {
    if (auto failure = found->second.pipeline->consumers().failure()) return *std::move(failure);
  } else {
    auto pipeline = CapturePipeline::open(source);
    if (!pipeline) return std::move(pipeline).error();
    found = open_.emplace(key, Entry{*std::move(pipeline)}).first;
  }
  ++found->second.users;
  return PipelineLease(found->second.pipeline.get(), [this, key](CapturePipeline*) { giveBack(key); });
}

void PipelineRegistry::giveBack(const std::string& key) {
  const std::lock_guard lock(mutex_);
  const auto found = open_.find(key);
  if (found == open_.end() || --found->second.users > 0) return;
  open_.erase(found);  // closes the devices
}

}  // namespace lmx

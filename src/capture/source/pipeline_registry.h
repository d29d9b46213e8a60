// The capture pipelines that are open in this process, shared by all who ask for the same devices.
#pragma once
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "capture/source/capture_pipeline.h"

namespace lmx {

/// A user's hold on a pipeline. The devices are closed when the last one goes, before anybody can open them
/// again. Never drop the last one on a streaming thread: closing waits for those.
using PipelineLease = std::shared_ptr<CapturePipeline>;

/// Opening and closing happen under one lock: a device that is just being closed is never opened a second
/// time. Thread-safe.
class PipelineRegistry {
 public:
  /// The one of the process. Never destroyed: threads that outlive main may still give leases back.
  static PipelineRegistry& instance();

  /// Opens the devices, or joins the pipeline that has them open. Blocks while a device opens.
  Result<PipelineLease, CaptureError> acquire(const CaptureSource& source);

 private:
  PipelineRegistry() = default;
  void giveBack(const std::string& key);

  struct Entry {
    std::shared_ptr<CapturePipeline> pipeline;
    int users = 0;
  };
  std::mutex mutex_;
  std::map<std::string, Entry> open_;  // guarded by mutex_
};

}  // namespace lmx

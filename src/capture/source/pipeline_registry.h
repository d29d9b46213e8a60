// Shares open capture pipelines among all users of the same devices.
#pragma once
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "capture/source/capture_pipeline.h"

namespace lmx {

/// Keeps a pipeline open. When the last lease goes the devices are closed, before anybody can open them
/// again. Never drop the last lease on a streaming thread: closing waits for those threads.
using PipelineLease = std::shared_ptr<CapturePipeline>;

/// Opens and closes devices under one lock, so a device is never opened while it is still being closed.
/// Thread-safe.
class PipelineRegistry {
 public:
  /// The registry of this process. Never destroyed: threads that outlive main may still return leases.
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

// What the agent is given from outside.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"
#include "platform/child_process.h"
#include "platform/service_manager.h"

namespace lmx {

inline constexpr double kVersion = 100;
/// What the service manager knows the agent as.
inline constexpr const char* kServiceJob = "com.zandor.lmxagentd";

/// Scripted in tests.
struct AgentEnvironment {
  std::shared_ptr<CaptureFramework> framework;
  std::shared_ptr<ServiceManager> serviceManager;
  ChildRunner* children = nullptr;  ///< lives until the process ends
};

}  // namespace lmx

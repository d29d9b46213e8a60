// The agent's external dependencies.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"
#include "platform/child_process.h"
#include "platform/service_manager.h"

namespace lmx {

inline constexpr double kVersion = 100;
/// The agent's name for the service manager.
inline constexpr const char* kServiceJob = "com.zandor.lmxagentd";

/// All of them must be set. Tests pass scripted ones.
struct AgentEnvironment {
  std::shared_ptr<CaptureFramework> framework;
  std::shared_ptr<ServiceManager> serviceManager;
  ChildRunner* children = nullptr;  ///< lives until the process ends
};

}  // namespace lmx

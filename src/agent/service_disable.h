// Shuts down an agent whose configuration can't work.
#pragma once
#include "platform/service_manager.h"

namespace lmx {

/// Tells the service manager not to start this agent again and ends the process: with 78, or 71 when that
/// failed.
[[noreturn]] void disableService(ServiceManager& manager);

}  // namespace lmx

// The end of an agent whose configuration can't work.
#pragma once
#include "platform/service_manager.h"

namespace lmx {

/// Has the service manager never start this agent again, and ends the process: 78, or 71 when that failed.
[[noreturn]] void disableService(ServiceManager& manager);

}  // namespace lmx

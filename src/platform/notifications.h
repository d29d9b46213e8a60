// Announces start and stop over D-Bus.
#pragma once
#include <string>

namespace lmx {

/// Posts the notification `name` as a D-Bus signal on the system bus (interface "com.zandor.lmxagentd", path
/// "/com/zandor/lmxagentd", member = the part of `name` after the last dot, capitalised). The signal is
/// flushed before this returns. A missing bus is no error and costs one debug line. Main thread.
void notify_post(const std::string& name);

/// Posts the notification `name` as the same signal on the session bus.
void postDistributedNotification(const std::string& name);

}  // namespace lmx

// Announces start and stop over D-Bus.
#pragma once
#include <string>

namespace lmx {

/// The BSD-style notification `name`: a D-Bus signal of that name (interface "com.zandor.lmxagentd",
/// path "/com/zandor/lmxagentd", member = the part after the last dot, capitalised) on the system bus,
/// flushed before it returns. No bus is no error: one debug line. Main thread.
void notify_post(const std::string& name);

/// The distributed notification `name`: the same signal on the session bus.
void postDistributedNotification(const std::string& name);

}  // namespace lmx

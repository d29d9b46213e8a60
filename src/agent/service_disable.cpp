// Disables the service, with a fallback.
#include "agent/service_disable.h"

#include <unistd.h>

#include <cstdio>

#include "agent/agent_environment.h"
#include "model/codes.h"
#include "platform/log.h"

namespace lmx {
namespace {

/// Skips destructors, because other threads are still running.
[[noreturn]] void endProcess(ProcessEnd end) {
  std::fflush(nullptr);
  _exit(exitStatus(end));
}

}  // namespace

void disableService(ServiceManager& manager) {
  LMPLogMessage(nullptr, kLogNotice, "Disabling lmxagentd with keeperd...");
  if (manager.authorize()) {
    const auto error = manager.disable(kServiceJob);
    if (!error) endProcess(ProcessEnd::misconfigured);
    LMPLogMessage(nullptr, kLogCritical, "Unable to disable lmxagentd. KeeperToggle: error: %s\n",
                  error->c_str());
  }
  LMPLogMessage(nullptr, kLogCritical, "Removing job from keeperd.");
  manager.runShellCommand("/bin/keeperctl -1 remove com.zandor.lmxagentd");
  endProcess(ProcessEnd::operatingSystem);
}

}  // namespace lmx

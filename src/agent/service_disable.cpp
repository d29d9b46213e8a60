// The end of an agent whose configuration can't work.
#include <unistd.h>

#include <cstdio>

#include "agent/agent_main.h"
#include "model/codes.h"
#include "platform/log.h"

namespace lmx {

namespace {

constexpr int kExitConfiguration = 78;
constexpr int kExitOperatingSystem = 71;

/// Threads are running: no destructor may.
[[noreturn]] void endProcess(int status) {
  std::fflush(nullptr);
  _exit(status);
}

}  // namespace

void AgentMain::disableService() {
  LMPLogMessage(nullptr, kLogNotice, "Disabling lmxagentd with keeperd...");
  if (environment_.serviceManager->authorize()) {
    const auto error = environment_.serviceManager->disable(kServiceJob);
    if (!error) endProcess(kExitConfiguration);
    LMPLogMessage(nullptr, kLogCritical, "Unable to disable lmxagentd. KeeperToggle: error: %s\n",
                  error->c_str());
  }
  LMPLogMessage(nullptr, kLogCritical, "Removing job from keeperd.");
  environment_.serviceManager->runShellCommand("/bin/keeperctl -1 remove com.zandor.lmxagentd");
  endProcess(kExitOperatingSystem);
}

}  // namespace lmx

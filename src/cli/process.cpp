// Runs the process from main to its exit status.
#include "cli/process.h"

#include <malloc.h>

#include <clocale>
#include <memory>

#include "agent/agent_main.h"
#include "capture/api/capture_framework.h"
#include "cli/adhoc_client.h"
#include "cli/command_line.h"
#include "model/codes.h"
#include "platform/log.h"
#include "platform/notifications.h"
#include "platform/paths.h"

namespace lmx {
namespace {

std::shared_ptr<ServiceManager> newServiceManager() {
  return systemPath("").empty() ? newSystemServiceManager() : newPrivateServiceManager();
}

int runAgent(int argc, char** argv, std::shared_ptr<CaptureFramework> framework) {
  // LC_CTYPE only: numbers in replies must keep their decimal point.
  if (std::setlocale(LC_CTYPE, "C.UTF-8") == nullptr) return exitStatus(ProcessEnd::operatingSystem);
  // Never destroyed; it lives until the process ends.
  static AgentMain& agent =
      *std::make_unique<AgentMain>(
           newAgentContext(),
           AgentEnvironment{std::move(framework), newServiceManager(), &systemChildRunner()})
           .release();
  const auto launched = lmp_gettimeofday();
  if (!launched) return exitStatus(ProcessEnd::operatingSystem);
  agent.agentContext()->state.launch_time.set(*launched);
  agent.agentContext()->state.running.set(true);
  const AgentEnvironment& environment = agent.environment();
  RunOptions& options = agent.agentContext()->options;
  int exitCode = 0;
  if (!CommandLine(options, *environment.framework, *environment.children).parseArgs(argv, argc, &exitCode)) {
    return exitCode;
  }
  return options.adhoc.get() ? AdHocClient(agent).startupAdHoc() : agent.startupDaemon();
}

}  // namespace

int runAgentProcess(int argc, char** argv, std::shared_ptr<CaptureFramework> framework) {
  // Many short-lived threads use the heap. With one arena each, memory would grow with every recording.
  mallopt(M_ARENA_MAX, 2);
  const int status = runAgent(argc, argv, std::move(framework));
  notify_post("com.zandor.lmxagentd.stopped");
  postDistributedNotification("com.zandor.lmxagentd.stopped");
  LMPLogMessage(nullptr, kLogInfo, "lmxagentd stopped");
  return status;
}

}  // namespace lmx

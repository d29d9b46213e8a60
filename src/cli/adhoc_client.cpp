// Talks to the daemon in ad-hoc mode.
#include "cli/adhoc_client.h"

#include <chrono>
#include <cstdio>
#include <string>

#include "agent/time_shift.h"
#include "cli/adhoc_command.h"
#include "model/codes.h"
#include "platform/log.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

/// A daemon that has not answered a STOP by then won't answer.
constexpr std::chrono::seconds kStopPatience{30};

/// Prints one line and flushes it: standard output may be a pipe, and the recording may be long.
void say(const char* what, const std::string& text) {
  std::printf("%s%s\n", what, text.c_str());
  std::fflush(stdout);
}

std::string orEmpty(const std::string& reply) { return reply.empty() ? "<empty>" : reply; }

}  // namespace

int AdHocClient::startupAdHoc() {
  static_cast<void>(agent_.environment().serviceManager->isEnabled(kServiceJob));
  if (!agent_.setupLoggingContext()) return exitStatus(ProcessEnd::operatingSystem);
  agent_.setupSignalHandlers();
  LMPLogMessage(context_.log_context(), kLogInfo, "lmxagentd (version %.0f) starting...", kVersion);

  if (client_.connect() != 0) return 0;
  say("Connected.", "");
  const std::string command = adHocCommand(context_.options);
  say("sending: ", command);
  std::string reply;
  // The daemon serves one peer at a time. The reply may have to wait for another peer, and an interrupt must
  // still work.
  if (client_.execCommand(command, &reply, [this] { return handleSignals(); }) != 0) return 0;
  say("received: ", orEmpty(reply));
  return context_.options.adhoc_request_type.get() == kAdHocRecording ? recordAdHoc() : 0;
}

int AdHocClient::recordAdHoc() {
  appLoopAdHoc();
  const auto end = std::chrono::steady_clock::now() + kStopPatience;
  std::string reply;
  client_.execCommand("STOP \n", &reply, [end] { return std::chrono::steady_clock::now() < end; });
  say("sent STOP, received: ", orEmpty(reply));
  if (reply.empty()) {  // don't resend: by now it might stop somebody else's recording
    std::fputs(
        "lmxagentd: the daemon has not answered the STOP, the recording may still be running; ask it with "
        "--status\n",
        stderr);
  }
  return 0;
}

bool AdHocClient::handleSignals() {
  while (agent_.mainRunLoop().run(0ms) == RunLoop::Turn::handledSource) {
  }
  return context_.state.running.get();
}

void AdHocClient::appLoopAdHoc() {
  do {
    if (agent_.devices().deviceDisconnected()) return agent_.devices().announceLostDevice();
    readTimeShift(context_.state);
    if (agent_.mainRunLoop().run(250ms) == RunLoop::Turn::stopped) return;
  } while (context_.state.running.get());
}

}  // namespace lmx

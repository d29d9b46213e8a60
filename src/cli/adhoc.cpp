// Ad-hoc mode: a client that has the running daemon do one thing, and for a recording stays until it is
// interrupted.
#include <chrono>
#include <cstdio>

#include "agent/agent_main.h"
#include "cli/adhoc_command.h"
#include "control/local/client_connect.h"
#include "model/codes.h"
#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr int kExitOperatingSystem = 71;
/// A daemon that has not answered a STOP by then won't.
constexpr std::chrono::seconds kStopPatience{30};

/// One line of the conversation, out at once: standard output may be a pipe, and the recording long.
void say(const char* what, const std::string& text) {
  std::printf("%s%s\n", what, text.c_str());
  std::fflush(stdout);
}

std::string orEmpty(const std::string& reply) { return reply.empty() ? "<empty>" : reply; }

}  // namespace

int AgentMain::startupAdHoc() {
  static_cast<void>(environment_.serviceManager->isEnabled(kServiceJob));
  if (!setupLoggingContext()) return kExitOperatingSystem;
  setupSignalHandlers();
  LMPLogMessage(context_->log_context(), kLogInfo, "lmxagentd (version %.0f) starting...", kVersion);

  ClientConnect client;
  if (client.connect() != 0) return 0;
  say("Connected.", "");
  const std::string command = adHocCommand(context_->options);
  say("sending: ", command);
  std::string reply;
  // The daemon serves one peer at a time: behind another one the answer may be far away, and an interrupt
  // must still be heard.
  if (client.execCommand(command, &reply, [this] { return handleSignals(); }) != 0) return 0;
  say("received: ", orEmpty(reply));
  return context_->options.adhoc_request_type.get() == kAdHocRecording ? recordAdHoc(client) : 0;
}

int AgentMain::recordAdHoc(ClientConnect& client) {
  const int result = appLoopAdHoc();
  const auto end = std::chrono::steady_clock::now() + kStopPatience;
  std::string reply;
  client.execCommand("STOP \n", &reply, [end] { return std::chrono::steady_clock::now() < end; });
  say("sent STOP, received: ", orEmpty(reply));
  if (reply.empty()) {  // not sent again: by now it might end somebody else's recording
    std::fputs(
        "lmxagentd: the daemon has not answered the STOP, the recording may still be running; ask it with "
        "--status\n",
        stderr);
  }
  return result;
}

bool AgentMain::handleSignals() {
  while (loop_.run(0ms) == RunLoop::Turn::handledSource) {
  }
  return context_->state.running.get();
}

int AgentMain::appLoopAdHoc() {
  for (;;) {
    if (deviceDisconnected()) return 0;
    readTimeShift();
    runLoopRunning_ = loop_.run(250ms) != RunLoop::Turn::stopped;
    if (!context_->state.running.get() || !runLoopRunning_) return 0;
  }
}

}  // namespace lmx

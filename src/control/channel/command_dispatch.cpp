// From a received chunk to the handler of its command.
#include <chrono>
#include <exception>
#include <map>

#include "control/channel/agent_control_base.h"
#include "control/protocol/command_parser.h"
#include "control/protocol/command_text.h"
#include "record/agent_record.h"

namespace lmx {

AgentControlBase::Handler AgentControlBase::handlerForVerb(std::string_view verb) {
  static const std::map<std::string_view, Handler> kVerbs{
      {"CANCEL", &AgentControlBase::handleCANCEL}, {"PAUSE", &AgentControlBase::handlePAUSE},
      {"RESUME", &AgentControlBase::handleRESUME}, {"SERVER", &AgentControlBase::handleSERVER},
      {"START", &AgentControlBase::handleSTART},   {"STATUS", &AgentControlBase::handleSTATUS},
      {"STOP", &AgentControlBase::handleSTOP},     {"TIMEDCMD", &AgentControlBase::handleTIMEDCMD},
  };
  const auto found = kVerbs.find(verb);
  return found == kVerbs.end() ? nullptr : found->second;
}

void AgentControlBase::packetReceived(const char* bytes, std::uint32_t size) {
  try {
    const auto result = partial_command_.feed(std::string_view(bytes, size));
    if (result.appended) LMPLogMessage(logContext(), kLogDebug, "Appending to existing partial command");
    if (result.dropped) {
      LMPLogMessage(logContext(), kLogError, "Command of more than %zu bytes without an end dropped",
                    kPartialCommandLimit);
    }
    if (!result.line) return;
    if (const auto text = commandFromReceivedData(*result.line)) {
      executeCommand(std::string(trimLineBreaks(*text)));
    }
  } catch (const std::exception& problem) {
    // One command that can't be executed must not cost the channel.
    LMPLogMessage(logContext(), kLogCritical, "Internal error occurred: %s", problem.what());
  }
}

void AgentControlBase::executeCommand(const std::string& text) {
  LMPLogMessage(logContext(), kLogDebug, "Command is [%s]", withoutSecrets(text).c_str());
  const Command command = parseCommand(text);
  const auto start = std::chrono::steady_clock::now();
  dispatch(command.verb, command.parameters ? &*command.parameters : nullptr, text);
  if (const auto session = this->session()) session->updateLastContact();
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
  LMPLogMessage(logContext(), kLogDebug, "Command: %s took %0.5lf seconds", command.verb.c_str(),
                elapsed.count());
}

void AgentControlBase::dispatch(const std::string& verb, const Dictionary* parameters,
                                const std::string& text) {
  const auto logError = [&](const char* what) {
    LMPLogMessage(logContext(), kLogError, "%s [%s]", what, withoutSecrets(text).c_str());
  };
  // USERAUTH is how a peer passes the gate, so it stands outside it.
  if (verb != "USERAUTH" && requiresAuthentication()) {
    logError("Command rejected because authentication is required");
    sendReply("cmdStatus=36");
  } else if (const Handler handler = handlerForVerb(verb)) {
    (this->*handler)(parameters);
  } else if (verb.starts_with("X-")) {
    handleXCMD(verb, parameters);
  } else {
    logError(verb == "ERR" ? "Received error from tunnel" : "Unknown command");
  }
}

}  // namespace lmx

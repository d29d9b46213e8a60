// From the text of a command to its handler.
#include "control/channel/command_dispatcher.h"

#include <chrono>

#include "control/protocol/command_text.h"
#include "control/protocol/reply.h"
#include "record/agent_record.h"

namespace lmx {

void CommandDispatcher::execute(const std::string& text, bool authenticated) {
  LMPLogMessage(context_.log(), kLogDebug, "Command is [%s]", withoutSecrets(text).c_str());
  const Command command = parseCommand(text);
  const auto start = std::chrono::steady_clock::now();
  dispatch(command, text, authenticated);
  if (const auto session = context_.session()) session->updateLastContact();
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
  LMPLogMessage(context_.log(), kLogDebug, "Command: %s took %0.5lf seconds", command.verb.c_str(),
                elapsed.count());
}

void CommandDispatcher::dispatch(const Command& command, const std::string& text, bool authenticated) {
  const Dictionary* parameters = command.parameters ? &*command.parameters : nullptr;
  // USERAUTH is how a peer passes the gate, so it stands outside it.
  if (!authenticated && command.verb != "USERAUTH") {
    logRefusal("Command rejected because authentication is required", text);
    replies_.sendReply(replyText(CommandError::notAuthenticated));
  } else if (const auto* handler = handlers_.verbs().handlerForVerb(command.verb)) {
    (*handler)(parameters);
  } else if (command.verb.starts_with("X-")) {
    handlers_.extension().handleXCMD(command.verb, parameters);
  } else {
    logRefusal(command.verb == "ERR" ? "Received error from tunnel" : "Unknown command", text);
  }
}

void CommandDispatcher::logRefusal(const char* why, const std::string& text) const {
  LMPLogMessage(context_.log(), kLogError, "%s [%s]", why, withoutSecrets(text).c_str());
}

}  // namespace lmx

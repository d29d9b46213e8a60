// From the text of a command to its handler.
#pragma once
#include <string>

#include "control/handlers/channel_context.h"
#include "control/handlers/command_handlers.h"
#include "control/handlers/reply_sink.h"
#include "control/protocol/command_parser.h"

namespace lmx {

class CommandDispatcher {
 public:
  /// All three outlive this object.
  CommandDispatcher(const ChannelContext& context, CommandHandlers& handlers, ReplySink& replies)
      : context_(context), handlers_(handlers), replies_(replies) {}

  /// Runs one command. Known or not, it counts as contact with the server. Channel thread.
  /// @param authenticated  false: every command but USERAUTH is refused
  void execute(const std::string& text, bool authenticated);

 private:
  void dispatch(const Command& command, const std::string& text, bool authenticated);
  void logRefusal(const char* why, const std::string& text) const;

  const ChannelContext& context_;
  CommandHandlers& handlers_;
  ReplySink& replies_;
};

}  // namespace lmx

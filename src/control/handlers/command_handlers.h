// The handlers of one channel, and the table that finds them by verb.
#pragma once
#include "control/handlers/channel_context.h"
#include "control/handlers/extension_command.h"
#include "control/handlers/recording_commands.h"
#include "control/handlers/reply_sink.h"
#include "control/handlers/server_command.h"
#include "control/handlers/status_command.h"
#include "control/handlers/timed_commands.h"
#include "control/handlers/verb_table.h"

namespace lmx {

/// What one of these is told (the server's protocol, the last START) holds for its channel alone.
class CommandHandlers {
 public:
  /// All of them outlive this object; `actions` may be null.
  CommandHandlers(const ChannelContext& context, AgentActions* actions, ReplySink& replies,
                  ChannelKind channel);
  CommandHandlers(const CommandHandlers&) = delete;
  CommandHandlers& operator=(const CommandHandlers&) = delete;

  [[nodiscard]] const VerbTable& verbs() const { return verbs_; }
  /// Takes every verb that begins with "X-"; these can't be timed, so they are not in the table.
  [[nodiscard]] ExtensionCommand& extension() { return extension_; }
  [[nodiscard]] RecordingCommands& recording() { return recording_; }
  [[nodiscard]] const ServerCommand& server() const { return server_; }
  [[nodiscard]] TimedCommands& timed() { return timed_; }

 private:
  RecordingCommands recording_;
  StatusCommand status_;
  ServerCommand server_;
  ExtensionCommand extension_;
  TimedCommands timed_;
  const VerbTable verbs_;
};

}  // namespace lmx

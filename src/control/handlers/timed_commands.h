// TIMEDCMD: commands that run later.
#pragma once
#include <string>

#include "control/handlers/channel_context.h"
#include "control/handlers/reply_sink.h"
#include "control/handlers/verb_table.h"
#include "model/agent_actions.h"
#include "support/dictionary.h"

namespace lmx {

/// The commands that wait stand in the context's list and in the timers file; the main loop runs each at its
/// time. The list and its file are thread-safe.
class TimedCommands {
 public:
  /// @param context, replies, verbs  outlive this object; `verbs` may still be under construction
  /// @param actions  outlives this object; null: nobody runs what is scheduled
  /// @param channel  who is to run what comes in here
  TimedCommands(const ChannelContext& context, AgentActions* actions, ReplySink& replies,
                const VerbTable& verbs, ChannelKind channel)
      : context_(context), actions_(actions), replies_(replies), verbs_(verbs), channel_(channel) {}

  /// TIMEDCMD command=START,time=2030-01-01 10:00:00 +0000,…  →  cmdStatus=0
  void handleTIMEDCMD(const Dictionary* parameters);

  /// Runs a command whose time has come. Its reply comes unasked. Main thread.
  void completeTimedCommand(const SharedDictionary& entry);
  /// Schedules what the timers file holds. A file that can't be read is kept under another name. Main thread.
  void loadTimedCommands();
  /// The list into its file, whole. Any thread.
  void writeTimerListToDisk();

 private:
  enum class Origin { peer, file };
  bool scheduleCommand(const Dictionary* parameters, Origin origin);
  bool append(const SharedDictionary& entry, Origin origin);
  void revoke(const Dictionary* parameters);
  [[nodiscard]] std::string timerListReply() const;
  void reply(CommandError error);

  const ChannelContext& context_;
  AgentActions* const actions_;
  ReplySink& replies_;
  const VerbTable& verbs_;
  const ChannelKind channel_;
};

}  // namespace lmx

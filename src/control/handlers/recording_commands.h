// The commands that drive a recording: START, STOP, PAUSE, RESUME, CANCEL.
#pragma once
#include <string>

#include "control/handlers/channel_context.h"
#include "control/handlers/reply_sink.h"
#include "model/agent_actions.h"
#include "support/dictionary.h"
#include "support/shared_value.h"

namespace lmx {

/// Each handler replies at most once; `parameters` is null when the command had none. They run on the
/// channel's thread, or on the main thread when a timer runs them: what they ask of it is then done in place.
/// In continuous mode the capture runs all the time and the commands only mark times.
class RecordingCommands {
 public:
  /// All three outlive this object.
  /// @param actions  null: what is asked of the main thread is not done
  RecordingCommands(const ChannelContext& context, AgentActions* actions, ReplySink& replies)
      : context_(context), actions_(actions), replies_(replies) {}

  /// START RecordingMetadata_RECORDING_UUID=…,RecordingMetadata_MAX_RECORDING_MINUTES=50,…  →  cmdStatus=0
  void handleSTART(const Dictionary* parameters);
  /// STOP  →  cmdStatus=0
  void handleSTOP(const Dictionary* parameters);
  /// PAUSE  →  cmdStatus=0
  void handlePAUSE(const Dictionary* parameters);
  /// RESUME  →  cmdStatus=0
  void handleRESUME(const Dictionary* parameters);
  /// CANCEL  →  cmdStatus=0
  void handleCANCEL(const Dictionary* parameters);

  /// Takes over the recording properties that came with a command. @return 0, or 1 when given none.
  int configure(const Dictionary* parameters);

  /// Recording properties that came with the last START; null before.
  SharedValue<SharedDictionary> properties;

 private:
  [[nodiscard]] bool canStart(const Dictionary* parameters) const;
  void prepare(AgentState& state);
  void markStart(AgentRecord& session, const std::string& request,
                 const SharedDictionary& request_properties) const;
  void markStop(AgentRecord& session) const;
  bool performOnMain(AgentActions::Action action, Wait wait);
  [[nodiscard]] bool continuous() const;
  [[nodiscard]] double shiftedReferenceTime() const;
  void reply(CommandError error);

  const ChannelContext& context_;
  AgentActions* const actions_;
  ReplySink& replies_;
};

}  // namespace lmx

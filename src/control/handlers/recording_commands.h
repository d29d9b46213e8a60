// The commands that drive a recording: START, STOP, PAUSE, RESUME, CANCEL.
#pragma once
#include <memory>
#include <string>

#include "capture/api/capture_framework.h"
#include "control/handlers/channel_context.h"
#include "control/handlers/reply_sink.h"
#include "model/agent_actions.h"
#include "support/dictionary.h"

namespace lmx {

/// Each handler replies at most once; `parameters` is null when the command had none. They run on the
/// channel's thread, or on the main thread when a timer runs them: what they ask of it is then done in place.
/// In continuous mode the capture runs all the time and the commands only mark times. They keep nothing
/// between two commands.
class RecordingCommands {
 public:
  /// All three outlive this object.
  /// @param actions  null: what is asked of the main thread is not done
  RecordingCommands(const ChannelContext& context, AgentActions* actions, ReplySink& replies)
      : context_(context), actions_(actions), replies_(replies) {}

  /// START RecordingMetadata_RECORDING_UUID=…,RecordingMetadata_MAX_RECORDING_MINUTES=50,…  →  cmdStatus=0
  void handleSTART(const Dictionary* parameters);
  /// STOP  →  cmdStatus=0. By then a power cut can't undo it, unless a timer gave the command.
  void handleSTOP(const Dictionary* parameters);
  /// PAUSE  →  cmdStatus=0
  void handlePAUSE(const Dictionary* parameters);
  /// RESUME  →  cmdStatus=0
  void handleRESUME(const Dictionary* parameters);
  /// CANCEL  →  cmdStatus=0
  void handleCANCEL(const Dictionary* parameters);

 private:
  void performFor(const std::string& request, AgentActions::Action action, Wait wait);
  void syncMarks(const std::shared_ptr<LMRCaptureController>& capture) const;
  [[nodiscard]] bool continuous() const;
  [[nodiscard]] double shiftedReferenceTime() const;
  void reply(CommandError error);

  const ChannelContext& context_;
  AgentActions* const actions_;
  ReplySink& replies_;
};

}  // namespace lmx

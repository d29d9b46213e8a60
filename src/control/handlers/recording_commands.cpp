// The commands that drive a recording: START, STOP, PAUSE, RESUME, CANCEL.
#include "control/handlers/recording_commands.h"

#include "control/handlers/recording_configuration.h"
#include "control/protocol/command_parser.h"
#include "control/protocol/reply.h"
#include "model/metadata_keys.h"
#include "platform/identifiers.h"
#include "record/agent_record.h"

namespace lmx {
namespace {

/// What an earlier recording has left would end the new one.
void forgetDeadlinesOfEarlierRecording(AgentRecord& session) {
  if (session.status.get() != kRecorderIdle) return;
  session.stop_times.hardStopTime.set(std::nullopt);
  session.stop_times.softStopTime.set(std::nullopt);
}

}  // namespace

void RecordingCommands::handleSTART(const Dictionary* parameters) {
  const auto context = context_.get();
  if (!context) {
    LMPLogMessage(nullptr, kLogError, "handleSTART: No agent context");
    return;
  }
  if (!canStart(parameters)) return reply(CommandError::missingParameter);
  const auto session = context->record_context();
  if (session) forgetDeadlinesOfEarlierRecording(*session);
  if (configure(parameters) != 0) return reply(CommandError::noSession);

  if (session && isTrue(parameters, metadata_key::kAudioOnly)) {
    session->recordingType.set(kRecordingTypeAudio);
    LMPLogMessage(context->log_context(), kLogDebug, "%s: switching to audio-only recording type",
                  metadata_key::kAudioOnly);
  }
  const SharedDictionary recording_properties = properties.get();
  context->state.status.set(kRecordSuccess);
  context->state.properties.set(recording_properties);
  if (!continuous()) prepare(context->state);
  if (session) {
    const std::string request = newUUIDString();
    session->request_uuid.set(request);
    session->request_properties.set(recording_properties);
    markStart(*session, request, recording_properties);
  }
  replies_.sendReply(replyText(context->state.status.get()));
}

bool RecordingCommands::canStart(const Dictionary* parameters) const {
  const auto recording = lookUp(parameters, metadata_key::kRecordingUUID);
  if (!recording || !lookUp(parameters, metadata_key::kMaxRecordingMinutes) ||
      !lookUp(parameters, metadata_key::kUnattendedMinutes)) {
    return false;
  }
  if (recording->find('/') == std::string::npos) return true;
  LMPLogMessage(context_.log(), kLogError, "START refused: %s names the movie and must not hold a \"/\"",
                metadata_key::kRecordingUUID);
  return false;
}

int RecordingCommands::configure(const Dictionary* parameters) {
  if (parameters == nullptr) return 1;
  properties.set(std::make_shared<const Dictionary>(*parameters));
  const auto context = context_.get();
  if (!context) return 0;
  if (const auto session = context->record_context()) configureStopTimes(*parameters, session->stop_times);
  configureSubmission(*parameters, context->options);
  return 0;
}

void RecordingCommands::prepare(AgentState& state) {
  if (actions_ == nullptr || actions_->perform(&AgentActions::prepareCapture, Wait::untilDone)) return;
  // The main loop has ended, so nothing was prepared: the peer must not take this for a recording.
  state.status.set(kRecordInvalidType);
}

void RecordingCommands::handleSTOP(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  markStop(*session);
  performOnMain(&AgentActions::stopRecording, Wait::no);
  reply(CommandError::none);
}

// PAUSE marks before it pauses and RESUME resumes before it marks: both marks fall where the capture is
// running.

void RecordingCommands::handlePAUSE(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  markStop(*session);
  if (!continuous()) performOnMain(&AgentActions::pauseCapture, Wait::untilDone);
  reply(CommandError::none);
}

void RecordingCommands::handleRESUME(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  if (!continuous()) performOnMain(&AgentActions::resumeCapture, Wait::untilDone);
  markStart(*session, session->request_uuid.get(), session->request_properties.get());
  reply(CommandError::none);
}

void RecordingCommands::handleCANCEL(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  if (const auto capture = session->captureController.get())
    capture->cancelRequestWithUUID(session->request_uuid.get());
  if (!continuous()) performOnMain(&AgentActions::cancelCapture, Wait::no);
  reply(CommandError::none);
}

/// The request begins, or goes on, now. Takes it from the caller: another channel's START may replace the
/// session's at any time.
void RecordingCommands::markStart(AgentRecord& session, const std::string& request,
                                  const SharedDictionary& request_properties) const {
  if (const auto capture = session.captureController.get())
    capture->setStartWithUUID(request, shiftedReferenceTime(), request_properties);
}

/// The session's request ends, or rests, now.
void RecordingCommands::markStop(AgentRecord& session) const {
  if (const auto capture = session.captureController.get())
    capture->setStopWithUUID(session.request_uuid.get(), shiftedReferenceTime());
}

bool RecordingCommands::performOnMain(AgentActions::Action action, Wait wait) {
  return actions_ != nullptr && actions_->perform(action, wait);
}

bool RecordingCommands::continuous() const {
  const auto context = context_.get();
  return context && context->recording.isContinuous();
}

/// The moment that counts as now, on the scale of the marks.
double RecordingCommands::shiftedReferenceTime() const {
  const auto context = context_.get();
  return secondsSinceReferenceDate() - (context ? context->state.timeshift_seconds.get() : 0);
}

void RecordingCommands::reply(CommandError error) { replies_.sendReply(replyText(error)); }

}  // namespace lmx

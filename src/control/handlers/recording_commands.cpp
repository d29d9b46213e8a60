// The commands that drive a recording: START, STOP, PAUSE, RESUME, CANCEL.
#include "control/handlers/recording_commands.h"

#include "control/handlers/start_parameters.h"
#include "control/protocol/reply.h"
#include "platform/work_queue.h"
#include "record/agent_record.h"

namespace lmx {

void RecordingCommands::handleSTART(const Dictionary* parameters) {
  const auto context = context_.get();
  if (!context) {
    LMPLogMessage(nullptr, kLogError, "handleSTART: No agent context");
    return;
  }
  const StartCheck check = checkStart(parameters);
  if (!check.problem.empty())
    LMPLogMessage(context_.log(), kLogError, "START refused: %s", check.problem.c_str());
  if (!check.accepted) return reply(CommandError::missingParameter);
  if (actions_ == nullptr) return reply(CommandError::noSession);
  const int result = actions_->performStart(std::make_shared<const Dictionary>(*parameters));
  replies_.sendReply(replyText(result));
}

void RecordingCommands::handleSTOP(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  const std::string request = session->addressedRequest();
  const bool preparing = request != session->request.get().uuid;
  auto capture = session->captureController.get();
  if (capture && !preparing) {
    capture->setStopWithUUID(request, shiftedReferenceTime());
    capture->submitRequestWithUUID(request);
  }
  // A recording without a capture has no journal: the main thread itself stores its job.
  const bool waits = preparing || session->recordedType() == kRecordingTypeFile;
  performFor(request, &AgentActions::stopRecording, waits ? Wait::untilDone : Wait::no);
  if (preparing) {
    capture = session->captureController.get();
    if (capture) capture->submitRequestWithUUID(request);
  }
  if (capture) syncMarks(capture);
  reply(CommandError::none);
}

/// The main thread does not wait for the disk.
void RecordingCommands::syncMarks(const std::shared_ptr<LMRCaptureController>& capture) const {
  if (actions_ != nullptr && actions_->isMainThread()) {
    dispatchAsync([capture] { capture->syncMarks(); });
  } else {
    capture->syncMarks();
  }
}

// PAUSE marks before it pauses and RESUME resumes before it marks: both marks fall where the capture is
// running.

void RecordingCommands::handlePAUSE(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  const std::string request = session->addressedRequest();
  if (const auto capture = session->captureController.get())
    capture->setStopWithUUID(request, shiftedReferenceTime());
  if (!continuous()) performFor(request, &AgentActions::pauseCapture, Wait::untilDone);
  reply(CommandError::none);
}

void RecordingCommands::handleRESUME(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  const std::string addressed = session->addressedRequest();
  if (!continuous()) performFor(addressed, &AgentActions::resumeCapture, Wait::untilDone);
  const RecordingRequest request = session->request.get();
  const auto capture = session->captureController.get();
  if (capture && request.uuid == addressed)
    capture->setStartWithUUID(request.uuid, shiftedReferenceTime(), request.properties);
  reply(CommandError::none);
}

void RecordingCommands::handleCANCEL(const Dictionary*) {
  const auto session = context_.session();
  if (!session) return reply(CommandError::noSession);
  const std::string request = session->addressedRequest();
  if (const auto capture = session->captureController.get()) capture->cancelRequestWithUUID(request);
  if (!continuous()) performFor(request, &AgentActions::cancelRecording, Wait::no);
  reply(CommandError::none);
}

void RecordingCommands::performFor(const std::string& request, AgentActions::Action action, Wait wait) {
  if (actions_ != nullptr) actions_->performFor(request, action, wait);
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

// The commands that drive a recording: START, STOP, PAUSE, RESUME, CANCEL, and the notices SERVER and
// X-PREVIEW.
#include "control/channel/agent_control_base.h"
#include "control/protocol/command_parser.h"
#include "control/protocol/command_text.h"
#include "model/codes.h"
#include "platform/identifiers.h"
#include "record/agent_record.h"
#include "record/preview_controller.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr const char* kDone = "cmdStatus=0";
constexpr const char* kNoSession = "cmdStatus=1";
constexpr const char* kMissingParameter = "cmdStatus=31";

bool hasStartParameters(const Dictionary* parameters) {
  return lookUp(parameters, "RecordingMetadata_RECORDING_UUID") &&
         lookUp(parameters, "RecordingMetadata_MAX_RECORDING_MINUTES") &&
         lookUp(parameters, "RecordingMetadata_UNATTENDED_RECORDING_MINUTES");
}

}  // namespace

bool AgentControlBase::performOnMain(AgentActions::Action action, Wait wait) {
  return actions_ != nullptr && actions_->perform(action, wait);
}

/// In continuous mode the capture runs all the time and the commands only mark times.
bool AgentControlBase::continuous() const {
  const auto context = agentContext();
  const auto info = context ? context->recording.continuous.get() : std::nullopt;
  return info && info->enabled;
}

/// The moment that counts as now, on the scale of the marks.
double AgentControlBase::shiftedReferenceTime() const {
  const auto context = agentContext();
  return secondsSinceReferenceDate() - (context ? context->state.timeshift_seconds.get() : 0);
}

void AgentControlBase::handleSTART(const Dictionary* parameters) {
  const auto context = agentContext();
  if (!context) {
    LMPLogMessage(nullptr, kLogError, "handleSTART: No agent context");
    return;
  }
  if (!hasStartParameters(parameters)) return sendReply(kMissingParameter);
  if (lookUp(parameters, "RecordingMetadata_RECORDING_UUID")->find('/') != std::string::npos) {
    LMPLogMessage(
        context->log_context(), kLogError,
        "START refused: RecordingMetadata_RECORDING_UUID names the movie and must not hold a \"/\"");
    return sendReply(kMissingParameter);
  }
  const auto session = context->record_context();
  if (session &&
      session->status.get() == kRecorderIdle) {  // what an earlier recording has left would end this one
    session->stop_times.hardStopTime.set(std::nullopt);
    session->stop_times.softStopTime.set(std::nullopt);
  }
  if (configure(parameters) != 0) return sendReply("cmdStatus=1");

  if (session && isTrue(parameters, "RecordingMetadata_AUDIO_ONLY")) {
    session->recordingType.set(kRecordingTypeAudio);
    LMPLogMessage(context->log_context(), kLogDebug,
                  "RecordingMetadata_AUDIO_ONLY: switching to audio-only recording type");
  }
  context->state.status.set(0);
  const SharedDictionary recording_properties = properties.get();
  context->state.properties.set(recording_properties);
  if (!continuous() && actions() != nullptr &&
      !performOnMain(&AgentActions::prepareCapture, Wait::untilDone)) {
    // The main loop has ended, so nothing was prepared: the peer must not take this for a recording.
    context->state.status.set(kRecordInvalidType);
  }
  if (session) {
    const std::string request = newUUIDString();
    session->request_uuid.set(request);
    session->request_properties.set(recording_properties);
    if (const auto capture = session->captureController.get()) {
      capture->setStartWithUUID(request, shiftedReferenceTime(), recording_properties);
    }
  }
  sendReply(string_with_format("cmdStatus=%i", context->state.status.get()));
}

void AgentControlBase::handleSTOP(const Dictionary*) {
  const auto session = this->session();
  if (!session) return sendReply(kNoSession);
  if (const auto capture = session->captureController.get()) {
    capture->setStopWithUUID(session->request_uuid.get(), shiftedReferenceTime());
  }
  performOnMain(&AgentActions::stopRecording, Wait::no);
  sendReply(kDone);
}

// PAUSE marks before it pauses and RESUME resumes before it marks: both marks fall where the capture is
// running.

void AgentControlBase::handlePAUSE(const Dictionary*) {
  const auto session = this->session();
  if (!session) return sendReply(kNoSession);
  if (const auto capture = session->captureController.get()) {
    capture->setStopWithUUID(session->request_uuid.get(), shiftedReferenceTime());
  }
  if (!continuous()) performOnMain(&AgentActions::pauseCapture, Wait::untilDone);
  sendReply(kDone);
}

void AgentControlBase::handleRESUME(const Dictionary*) {
  const auto session = this->session();
  if (!session) return sendReply(kNoSession);
  if (!continuous()) performOnMain(&AgentActions::resumeCapture, Wait::untilDone);
  if (const auto capture = session->captureController.get()) {
    capture->setStartWithUUID(session->request_uuid.get(), shiftedReferenceTime(),
                              session->request_properties.get());
  }
  sendReply(kDone);
}

void AgentControlBase::handleCANCEL(const Dictionary*) {
  const auto session = this->session();
  if (!session) return sendReply(kNoSession);
  if (const auto capture = session->captureController.get())
    capture->cancelRequestWithUUID(session->request_uuid.get());
  if (!continuous()) performOnMain(&AgentActions::cancelCapture, Wait::no);
  sendReply(kDone);
}

void AgentControlBase::handleSERVER(const Dictionary* parameters) {
  const auto version = lookUp(parameters, "version");
  const auto server = lookUp(parameters, "server_uuid");
  if (!version || !server) return sendReply(kMissingParameter);
  const auto context = agentContext();
  const auto own = context ? context->server.server_uuid.get() : std::nullopt;
  if (own == server) {
    LMPLogMessage(context->log_context(), kLogInfo, "Server is: %s", own->c_str());
  } else {
    logInfo("Server UUID does not match");
  }
  setServer_protocol_version(decimalValue(*version));
}

void AgentControlBase::handleXCMD(std::string_view verb, const Dictionary* parameters) {
  if (verb != "X-PREVIEW") return;
  const auto interval = lookUp(parameters, "refresh_milliseconds");
  const auto session = this->session();
  const auto controller = session ? session->previewController.get() : nullptr;
  if (!interval || !controller) return;
  const std::shared_ptr<LMRPreviewControllerDelegate> delegate = controller->delegate();
  if (delegate) delegate->setFrameGrabInterval(decimalValue(*interval));
}

}  // namespace lmx

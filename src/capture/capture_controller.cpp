// Preparing, commands, marks, status.
#include "capture/capture_controller.h"

#include "model/codes.h"

namespace lmx {

// ---- preparing and the end

void CaptureController::setDelegate(std::weak_ptr<CaptureControllerDelegate> delegate) {
  const std::lock_guard lock(mutex_);
  delegate_ = std::move(delegate);
}

bool CaptureController::prepareRecording(const LMRRecordingContext& settings,
                                         std::shared_ptr<CaptureSession> /*session*/) {
  const auto plan = planRecording(settings);
  if (!plan) return refuse(plan.error());
  const auto opened = CaptureRecorder::open(*plan);
  if (!opened) return refuse(opened.error());
  {
    const std::lock_guard lock(mutex_);
    recorder_ = *opened;
    repository_ = plan->repository;
  }
  const auto self = shared_from_this();
  const auto problem = (*opened)->run([self] { return self->reportOfTheEnd(); },
                                      [self](const CaptureError* error) { self->reportSound(error); });
  if (problem) {
    const std::lock_guard lock(mutex_);
    recorder_ = nullptr;
    refusal_ = *problem;
    return false;
  }
  return true;
}

std::shared_ptr<CaptureControllerDelegate> CaptureController::delegate() const {
  const std::lock_guard lock(mutex_);
  return delegate_.lock();
}

void CaptureController::reportSound(const CaptureError* error) {
  const auto delegate = this->delegate();
  if (!delegate) return;
  error != nullptr ? delegate->lmrCaptureSoundLost(*error) : delegate->lmrCaptureSoundBack();
}

bool CaptureController::refuse(const CaptureError& reason) {
  const std::lock_guard lock(mutex_);
  refusal_ = reason;
  return false;
}

CaptureRecorder::Report CaptureController::reportOfTheEnd() {
  const auto delegate = this->delegate();
  // The report keeps the controller alive as well: the delegate identifies the capture by it.
  return [self = shared_from_this(), delegate](const CaptureRecorder::Outcome& outcome) {
    if (!delegate) return;
    outcome.cancelled ? delegate->lmrCaptureDidCancel(outcome.error)
                      : delegate->lmrCaptureDidComplete(outcome.error);
  };
}

std::shared_ptr<CaptureRecorder> CaptureController::recorder() const {
  const std::lock_guard lock(mutex_);
  return recorder_;
}

std::optional<CaptureError> CaptureController::refusal() const {
  const std::lock_guard lock(mutex_);
  return refusal_;
}

// ---- commands

bool CaptureController::startRecording() {
  if (refusal()) return false;
  armed_ = true;
  if (const auto recorder = this->recorder()) recorder->startFlow();
  return true;
}

void CaptureController::stopRecording() {
  if (const auto recorder = this->recorder()) recorder->end(CaptureRecorder::Ending::stop);
}

void CaptureController::cancelRecording() {
  if (const auto recorder = this->recorder()) recorder->end(CaptureRecorder::Ending::cancel);
}

void CaptureController::pauseRecording() {
  if (const auto recorder = this->recorder()) recorder->marks().pause(recorder->runningTime());
}

void CaptureController::resumeRecording() {
  if (const auto recorder = this->recorder()) recorder->marks().resume(recorder->runningTime());
}

// ---- marks

void CaptureController::setStartWithUUID(const std::string& uuid) {
  const auto recorder = this->recorder();
  if (!recorder) return;
  armed_ = true;
  recorder->marks().tag(uuid, recorder->runningTime());
}

void CaptureController::setStopWithUUID(const std::string& uuid) {
  if (const auto recorder = this->recorder()) recorder->marks().untag(uuid, recorder->runningTime());
}

void CaptureController::setStartWithUUID(const std::string& uuid, double atTime,
                                         SharedDictionary parameters) {
  if (const auto recorder = this->recorder())
    recorder->marks().start(uuid, recorder->runningTimeAt(atTime), parameters);
}

void CaptureController::setStopWithUUID(const std::string& uuid, double atTime) {
  if (const auto recorder = this->recorder()) recorder->marks().stop(uuid, recorder->runningTimeAt(atTime));
}

void CaptureController::cancelRequestWithUUID(const std::string& uuid) {
  if (const auto recorder = this->recorder()) recorder->marks().cancel(uuid);
}

void CaptureController::submitRequestWithUUID(const std::string& uuid) {
  const auto recorder = this->recorder();
  if (!recorder) return;
  // Marks that are closed belong to the closed capture, which is about to be there.
  if (!recorder->marks().submit(uuid)) recorder->waitUntilFinished()->submit(uuid);
}

void CaptureController::syncMarks() {
  if (const auto recorder = this->recorder()) recorder->syncMarks();
}

// ---- status

double CaptureController::elapsedTimeForRequestWithUUID(const std::string& uuid) {
  const auto recorder = this->recorder();
  return recorder ? recorder->marks().elapsed(uuid, recorder->runningTime()) : 0;
}

std::int64_t CaptureController::elapsedTimeInMilliseconds() {
  const auto recorder = this->recorder();
  return recorder ? recorder->recordedMilliseconds() : 0;
}

int CaptureController::recordingState() {
  const auto recorder = this->recorder();
  if (!recorder || !armed_ || recorder->marks().endTime()) return kCaptureIdle;
  return recorder->marks().paused() ? kCapturePaused : kCaptureRecording;
}

bool CaptureController::hasShutDown() {
  const auto recorder = this->recorder();
  return recorder ? recorder->finished() != nullptr : refusal().has_value();
}

std::optional<CaptureError> CaptureController::lastError() {
  const auto recorder = this->recorder();
  return recorder ? recorder->error() : refusal();
}

std::shared_ptr<CaptureSession> CaptureController::session() {
  const auto recorder = this->recorder();
  return recorder ? recorder->session() : nullptr;
}

// ---- after the capture

std::optional<CaptureError> CaptureController::processRequestWithUUID(const std::string& uuid,
                                                                      const std::string& outputPath) {
  if (const auto recorder = this->recorder())
    return recorder->waitUntilFinished()->makeMovie(uuid, outputPath);
  return nothingFor(outputPath);
}

Result<std::string, CaptureError> CaptureController::processRequestBeside(const std::string& uuid,
                                                                          const std::string& outputPath) {
  if (const auto recorder = this->recorder())
    return recorder->waitUntilFinished()->makeMovieBeside(uuid, outputPath);
  return nothingFor(outputPath);
}

CaptureError CaptureController::nothingFor(const std::string& outputPath) const {
  const CaptureError nothing{CaptureError::kDomain, kNoMedia, "nothing was captured for " + outputPath};
  return refusal().value_or(nothing);
}

bool CaptureController::requestQueued(const std::string& uuid) {
  const auto recorder = this->recorder();
  const auto finished = recorder ? recorder->finished() : nullptr;
  return finished && finished->queued(uuid);
}

void CaptureController::requestHandedOver(const std::string& uuid) {
  const auto recorder = this->recorder();
  if (const auto finished = recorder ? recorder->finished() : nullptr) finished->handedOver(uuid);
}

std::vector<RecoveredRecording> CaptureController::recoverAbandonedRequests() {
  const auto recorder = this->recorder();
  if (!recorder) return {};
  std::string repository;
  {
    const std::lock_guard lock(mutex_);
    repository = repository_;
  }
  return recorder->waitUntilFinished()->recoverPending(repository);
}

}  // namespace lmx

// The controller's operations: preparing, commands, marks, status.
#include "capture/capture_controller.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <thread>

#include "platform/directories.h"
#include "platform/log.h"
#include "support/time_value.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr double kVirtualFrameSeconds = 0.01;  // the grain of cuts where there is only sound

int typeCode(CaptureType type) {
  switch (type) {
    case CaptureType::audio:
      return 1;
    case CaptureType::video:
      return 3;
    case CaptureType::file:
      return 4;
    case CaptureType::audioAndVideo:
      break;
  }
  return 2;
}

}  // namespace

void CaptureController::setDelegate(std::weak_ptr<CaptureControllerDelegate> delegate) {
  const std::lock_guard lock(mutex_);
  delegate_ = std::move(delegate);
}

bool CaptureController::fail(CaptureError error) {
  const std::lock_guard lock(mutex_);
  error_ = std::move(error);
  shut_down_ = true;
  pipeline_ = nullptr;
  return false;
}

bool CaptureController::prepareRecording(const LMRRecordingContext& settings,
                                         std::shared_ptr<CaptureSession> /*session*/) {
  // A session that a preview has open is found again by its devices: asking for the same ones joins it.
  settings_ = settings;
  if (!openSource(settings) || !openFiles(settings)) return false;
  describeMedia(settings);
  pipeline_->addConsumer(shared_from_this());
  std::thread([self = shared_from_this()] { self->run(); }).detach();
  return true;
}

bool CaptureController::openSource(const LMRRecordingContext& settings) {
  has_video_ = settings.videoEnabled;
  has_audio_ = settings.audioEnabled;
  CaptureSource source;
  if (has_video_) source.videoDevice = settings.videoDeviceID;
  if (has_audio_)
    source.audioDevice = settings.audioDeviceID ? settings.audioDeviceID : default_microphone_();
  if (has_video_ && !source.videoDevice)
    return fail({CaptureError::kDomain, kDeviceNotFound, "no camera is there"});
  if (has_audio_ && !source.audioDevice) {
    return fail({CaptureError::kDomain, kDeviceNotFound, "no microphone is there"});
  }
  frame_rate_ = frameRateFrom(settings.maximumFrameRate);
  source.frameRate = frame_rate_;
  if (settings.audioCompressionOptions) {
    source.sampleRate = settings.audioCompressionOptions->sampleRate;
    source.channels = settings.audioCompressionOptions->channels;
  }
  audio_encoding_.sampleRate = source.sampleRate;
  audio_encoding_.channels = source.channels;
  CaptureError error;
  auto pipeline = CapturePipeline::acquire(source, &error);
  if (!pipeline) return fail(error);
  const std::lock_guard lock(mutex_);
  pipeline_ = std::move(pipeline);
  return true;
}

bool CaptureController::openFiles(const LMRRecordingContext& settings) {
  repository_ = settings.captureTempDir;
  folder_ = captureFolderOf(repository_) + "/" + settings.uuid;
  // The end of the capture before takes their common folder away when it is empty: it may go in between.
  int error = ENOENT;
  for (int attempt = 0; error == ENOENT && attempt < 10; ++attempt) error = mkdir_p(folder_.c_str(), 0700);
  if (error != 0) {
    return fail({CaptureError::kDomain, kWriteFailed, "can't make " + folder_ + ": " + std::strerror(error)});
  }
  const std::string path = folder_ + "/" + FinishedCapture::kJournalName;
  journal_ = Journal::open(path, false);
  GrowingMovie movie;
  error = journal_ ? movie.create(folder_ + "/" + FinishedCapture::kMediaName) : errno;
  if (error == 0) {
    movie_ = std::move(movie);
    return true;
  }
  const CaptureError reason{CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
                            "can't write to " + folder_ + ": " + std::strerror(error)};
  if (journal_) FinishedCapture(folder_, journal_, {}, 0).removeIfResolved();
  rmdir(folder_.c_str());
  return fail(reason);
}

void CaptureController::describeMedia(const LMRRecordingContext& settings) {
  frame_seconds_ = has_video_ ? frame_rate_.frameSeconds() : kVirtualFrameSeconds;
  frames_.emplace(frame_seconds_);
  if (has_audio_) sound_.emplace(*frames_, static_cast<std::uint32_t>(audio_encoding_.sampleRate));
  if (settings.maxDurationMinutes > 0) max_duration_ = std::chrono::minutes(settings.maxDurationMinutes);
  journal_->capture(typeCode(settings.captureType), frame_seconds_, pipeline_->wallOffset());
}

// ---- commands

bool CaptureController::startRecording() {
  CapturePipeline::Lease pipeline;
  {
    const std::lock_guard lock(mutex_);
    if (shut_down_ && !finished_) return false;
    armed_ = true;
    pipeline = pipeline_;
  }
  if (pipeline) pipeline->start();
  return true;
}

void CaptureController::endNow(Ending how) {
  const std::lock_guard lock(mutex_);
  if (ending_ != Ending::no || shut_down_ || !pipeline_) return;
  ending_ = how;
  if (pipeline_->realTime()) {
    end_time_ = pipeline_->runningTime();
  } else {
    // As fast as possible there is no "now": the capture ends with the last mark.
    end_time_ = 0;
    for (const Request& request : marks_.requests()) {
      if (!request.spans.empty()) end_time_ = std::max(end_time_, request.spans.back().stop);
    }
  }
  // The frame that proves that all before it are here comes within a frame's time; a camera that has not
  // given its first picture yet gets longer, so that a recording stopped at once still holds one.
  const auto patience = recorded_frames_ > 0 ? 1s : 3s;
  end_deadline_ = pipeline_->realTime() ? std::chrono::steady_clock::now() + patience
                                        : std::chrono::steady_clock::time_point::max();
  changed_.notify_all();
}

void CaptureController::stopRecording() { endNow(Ending::stop); }
void CaptureController::cancelRecording() { endNow(Ending::cancel); }

void CaptureController::pauseRecording() {
  const std::lock_guard lock(mutex_);
  if (!pipeline_ || marks_.paused()) return;
  const double t = pipeline_->runningTime();
  marks_.pause(t);
  journal_->pause(t);
}

void CaptureController::resumeRecording() {
  const std::lock_guard lock(mutex_);
  if (!pipeline_ || !marks_.paused()) return;
  const double t = pipeline_->runningTime();
  marks_.resume(t);
  journal_->resume(t);
}

void CaptureController::setStartWithUUID(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  if (!pipeline_) return;
  armed_ = true;
  tag_uuid_ = uuid;
  tag_span_ = {.start = pipeline_->runningTime()};
}

void CaptureController::setStopWithUUID(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  if (uuid == tag_uuid_ && tag_span_.open())
    tag_span_.stop = pipeline_ ? pipeline_->runningTime() : closed_at_;
}

void CaptureController::setStartWithUUID(const std::string& uuid, double atTime,
                                         SharedDictionary parameters) {
  const std::lock_guard lock(mutex_);
  if (!pipeline_ || ending_ != Ending::no) return;
  const double t = pipeline_->runningTimeAt(atTime);
  marks_.start(uuid, t, parameters);
  journal_->start(uuid, t, parameters);
}

void CaptureController::setStopWithUUID(const std::string& uuid, double atTime) {
  const std::lock_guard lock(mutex_);
  if (!pipeline_ || marks_.find(uuid) == nullptr) return;
  const double t = pipeline_->runningTimeAt(atTime);
  marks_.stop(uuid, t);
  journal_->stop(uuid, t);
}

void CaptureController::cancelRequestWithUUID(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  if (!pipeline_ || marks_.find(uuid) == nullptr) return;
  marks_.cancel(uuid);
  journal_->cancel(uuid);
}

// ---- status

double CaptureController::elapsedTimeForRequestWithUUID(const std::string& uuid) {
  const std::lock_guard lock(mutex_);
  const double now = pipeline_ ? pipeline_->runningTime() : closed_at_;
  if (!uuid.empty() && uuid == tag_uuid_)
    return std::max(0.0, std::min(tag_span_.stop, now) - tag_span_.start);
  return marks_.elapsed(uuid, now);
}

std::int64_t CaptureController::elapsedTimeInMilliseconds() {
  return std::llround(recorded_frames_ * frame_seconds_ * 1000);
}

int CaptureController::recordingState() {
  const std::lock_guard lock(mutex_);
  if (shut_down_ || ending_ != Ending::no || !armed_) return 0;
  return marks_.paused() ? 4 : 3;
}

bool CaptureController::hasShutDown() {
  const std::lock_guard lock(mutex_);
  return shut_down_;
}

std::optional<CaptureError> CaptureController::lastError() {
  const std::lock_guard lock(mutex_);
  return error_;
}

std::shared_ptr<CaptureSession> CaptureController::session() { return pipeline(); }

CapturePipeline::Lease CaptureController::pipeline() {
  const std::lock_guard lock(mutex_);
  return pipeline_;
}

// ---- after the capture

std::optional<CaptureError> CaptureController::processRequestWithUUID(const std::string& uuid,
                                                                      const std::string& outputPath) {
  std::shared_ptr<FinishedCapture> finished;
  std::optional<CaptureError> error;
  {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return shut_down_; });
    finished = finished_;
    error = error_;
  }
  if (finished) return finished->makeMovie(uuid, outputPath);
  return error ? error
               : CaptureError{CaptureError::kDomain, kNoMedia, "nothing was captured for " + outputPath};
}

void CaptureController::requestHandedOver(const std::string& uuid) {
  std::shared_ptr<FinishedCapture> finished;
  {
    const std::lock_guard lock(mutex_);
    finished = finished_;
  }
  if (finished) finished->handedOver(uuid);
}

std::vector<RecoveredRecording> CaptureController::recoverAbandonedRequests() {
  std::shared_ptr<FinishedCapture> finished;
  {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return shut_down_; });
    finished = finished_;
  }
  return finished ? finished->recoverPending(repository_) : std::vector<RecoveredRecording>{};
}

}  // namespace lmx

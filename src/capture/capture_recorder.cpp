// Opening a capture, commands to it, and the recording thread.
#include "capture/capture_recorder.h"

#include <malloc.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cmath>
#include <cstring>
#include <exception>
#include <system_error>
#include <thread>

#include "platform/directories.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

/// How long a recording that ends waits for a disk that takes nothing.
constexpr auto kDiskPatience = 10s;

}  // namespace

// ---- opening

Result<std::shared_ptr<CaptureRecorder>, CaptureError> CaptureRecorder::open(const RecordingPlan& plan) {
  auto pipeline = PipelineRegistry::instance().acquire(plan.source);
  if (!pipeline) return std::move(pipeline).error();
  auto files = CaptureFiles::create(plan.repository, plan.uuid);
  if (!files) return std::move(files).error();
  return std::shared_ptr<CaptureRecorder>(new CaptureRecorder(plan, *std::move(pipeline), *std::move(files)));
}

CaptureRecorder::CaptureRecorder(const RecordingPlan& plan, PipelineLease pipeline, CaptureFiles files)
    : plan_(plan),
      frame_seconds_(plan.encoding.frameSeconds()),
      folder_(std::move(files.folder)),
      journal_(std::move(files.journal)),
      marks_(journal_),
      queue_(plan.encoding.video.has_value(), pipeline->realTime()),
      pipeline_(std::move(pipeline)),
      movie_(std::make_unique<MovieOutput>(plan.encoding, std::move(files.movie), *journal_, patience_,
                                           [this](const CaptureError& error) { fail(error); })),
      cutter_(plan.encoding, {marks_, *journal_, *movie_, [this] { return this->pipeline()->size(); }}) {
  journal_->capture(plan_.type, frame_seconds_, pipeline_->wallOffset());
}

std::optional<CaptureError> CaptureRecorder::run(Reporter reporter) {
  const PipelineLease pipeline = this->pipeline();
  pipeline->consumers().add(shared_from_this());
  try {
    // Detached: this thread may hold the last reference to the recorder, and a thread cannot join itself.
    std::thread([self = shared_from_this(), reporter = std::move(reporter)] {
      self->record(reporter);
      // The encoder has freed tens of megabytes that the heap would otherwise keep.
      malloc_trim(0);
    }).detach();
  } catch (const std::system_error& problem) {
    pipeline->consumers().remove(this);
    const std::lock_guard lock(mutex_);
    pipeline_ = nullptr;
    return CaptureError{CaptureError::kDomain, kEncoderFailed,
                        std::string("the recording thread could not be started: ") + problem.what()};
  }
  return std::nullopt;
}

// ---- commands

void CaptureRecorder::startFlow() {
  if (const PipelineLease pipeline = this->pipeline()) pipeline->start();
}

void CaptureRecorder::end(Ending how) {
  std::optional<double> now;  // absent for devices of "speed=max": their capture ends with the last mark
  bool realTime = false;
  {
    const std::lock_guard lock(mutex_);
    if (!pipeline_) return;
    realTime = pipeline_->realTime();
    if (realTime) now = pipeline_->runningTime();
  }
  if (!marks_.end(how, now)) return;
  // The recording ends with the first frame behind the end, which is due within a frame's time. A camera that
  // has not delivered any picture yet gets longer: a recording that is stopped at once still holds one.
  const auto patience = recorded_frames_ > 0 ? 1s : 3s;
  queue_.hurry(realTime ? MediaQueue::Clock::now() + patience : MediaQueue::Clock::time_point::max());
  if (realTime) patience_.set(Deadline::Clock::now() + kDiskPatience);
}

void CaptureRecorder::syncMarks() const {
  int error = journal_->sync();
  // Some file systems keep only the names in directories that have been synced.
  const std::string common = directoryOf(folder_);
  for (const std::string& directory : {folder_, common, directoryOf(common)}) {
    const int failure = syncDirectory(directory);
    if (failure != ENOENT && error == 0) error = failure;  // a capture that is done with has gone
  }
  if (error == 0) return;
  LMPLogMessage(nullptr, kLogError,
                "The marks of %s could not be synced: %s; a power cut now would lose them", folder_.c_str(),
                std::strerror(error));
}

// ---- status

double CaptureRecorder::runningTime() const {
  const std::lock_guard lock(mutex_);
  return pipeline_ ? pipeline_->runningTime() : closed_at_;
}

double CaptureRecorder::runningTimeAt(double wallTime) const {
  const std::lock_guard lock(mutex_);
  return pipeline_ ? pipeline_->runningTimeAt(wallTime) : closed_at_;
}

std::int64_t CaptureRecorder::recordedMilliseconds() const {
  return std::llround(recorded_frames_ * frame_seconds_ * 1000);
}

std::optional<CaptureError> CaptureRecorder::error() const {
  const std::lock_guard lock(mutex_);
  return error_;
}

PipelineLease CaptureRecorder::pipeline() const {
  const std::lock_guard lock(mutex_);
  return pipeline_;
}

std::shared_ptr<FinishedCapture> CaptureRecorder::finished() const {
  const std::lock_guard lock(mutex_);
  return finished_;
}

std::shared_ptr<FinishedCapture> CaptureRecorder::waitUntilFinished() const {
  std::unique_lock lock(mutex_);
  finished_set_.wait(lock, [this] { return finished_ != nullptr; });
  return finished_;
}

// ---- streaming threads, encoder, writer

void CaptureRecorder::onVideo(BufferHandle buffer, double runningTime) {
  queue_.pushVideo({std::move(buffer), runningTime});
}

void CaptureRecorder::onAudio(BufferHandle buffer, double runningTime) {
  queue_.pushAudio({std::move(buffer), runningTime});
}

void CaptureRecorder::onCaptureError(const CaptureError& error) { fail(error); }

void CaptureRecorder::fail(const CaptureError& error) {
  double now = 0;
  {
    const std::lock_guard lock(mutex_);
    if (!error_) error_ = error;
    if (!pipeline_) return;
    now = pipeline_->runningTime();
  }
  marks_.end(Ending::stop, now);
  queue_.hurry(MediaQueue::Clock::now());  // nothing more will come
  patience_.set(Deadline::Clock::now() + kDiskPatience);
}

// ---- the recording thread

void CaptureRecorder::record(const Reporter& reporter) {
  guarded([this] { recordUntilTheEnd(); });
  PipelineLease pipeline = this->pipeline();
  pipeline->consumers().remove(this);
  queue_.close();
  std::uint32_t frames = 0;
  guarded([this, &frames] { frames = closeMovie(); });
  // Whoever is to be told is held from before anybody can see that the capture has ended.
  const Report report = reporter();
  const std::optional<CaptureError> problem = error();
  publish(*pipeline, frames);
  movie_.reset();
  pipeline = nullptr;  // closes the devices unless somebody else has them
  finished()->removeIfResolved();
  report({marks_.cancelled(), problem});
}

/// Runs a step of the recording. No memory, no thread: what there is becomes the movie.
void CaptureRecorder::guarded(const std::function<void()>& step) {
  try {
    step();
  } catch (const std::exception& problem) {
    fail({CaptureError::kDomain, kEncoderFailed, problem.what()});
  }
}

void CaptureRecorder::recordUntilTheEnd() {
  for (bool more = true; more;) {
    MediaQueue::Batch batch = queue_.take();
    const bool inTime = batch.inTime;
    feed(std::move(batch));
    checkLimits();
    more = inTime && !reachedEnd();
  }
}

void CaptureRecorder::feed(MediaQueue::Batch batch) {
  for (const RawMedium& frame : batch.video) {
    cutter_.feedFrame(frame);
    recorded_frames_ = cutter_.recordedFrames();
    queue_.setPictureHorizon(cutter_.frames().horizon());
  }
  cutter_.feedSound(std::move(batch.audio));
  recorded_frames_ = cutter_.recordedFrames();
}

/// Whether all media up to the end have been fed, or no more will come.
bool CaptureRecorder::reachedEnd() const {
  const auto end = marks_.endTime();
  if (!end) return false;
  return marks_.worthless() || queue_.expired() || cutter_.reaches(*end);
}

void CaptureRecorder::checkLimits() {
  if (!plan_.maxDuration || limit_reached_) return;
  if (recorded_frames_ * frame_seconds_ < std::chrono::duration<double>(*plan_.maxDuration).count()) return;
  LMPLogMessage(nullptr, kLogNotice, "The recording has reached its maximal duration");
  limit_reached_ = true;
  end(Ending::stop);
}

/// Closes the movie, or discards it when no request wants it. @return how many frames it holds
std::uint32_t CaptureRecorder::closeMovie() {
  if (marks_.worthless()) {
    movie_.reset();
    return 0;
  }
  cutter_.close();
  movie_->close(cutter_.frames().frames(), cutter_.samples());
  return movie_->framesWritten(cutter_.frames().frames());
}

void CaptureRecorder::publish(CapturePipeline& pipeline, std::uint32_t totalFrames) {
  CaptureRecord record{
      .intact = true,
      .recordingType = recordingTypeOf(plan_.encoding.video.has_value(), plan_.encoding.audio.has_value()),
      .frameSeconds = frame_seconds_,
      .wallOffset = pipeline.wallOffset(),
      .runs = cutter_.frames().runs(),
      .marks = marks_.close(),
      .movies = {}};
  const double closedAt = endOfMedia(pipeline);
  const std::lock_guard lock(mutex_);
  closed_at_ = closedAt;
  finished_ = std::make_shared<FinishedCapture>(folder_, journal_, std::move(record), totalFrames);
  pipeline_ = nullptr;
  finished_set_.notify_all();
}

double CaptureRecorder::endOfMedia(const CapturePipeline& pipeline) const {
  const double end = marks_.endTime().value_or(0);
  return pipeline.realTime() ? std::min(end, pipeline.runningTime()) : end;
}

}  // namespace lmx

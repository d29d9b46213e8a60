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
#include <utility>

#include "capture/source/device_pipeline.h"
#include "platform/directories.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr double kChangeNotices = 60;  // seconds between them: a looped file changes back and forth
constexpr auto kIdle = 250ms;          // where there is only sound, silence goes on when none comes
constexpr auto kForEver = 24h;
/// How long a recording that ends waits for a disk that takes nothing.
constexpr auto kDiskPatience = 10s;

double soundSeconds(GstBuffer* sound) {
  return static_cast<double>(gst_buffer_get_size(sound)) / sizeof(float) / kSoundChannels / kSoundRate;
}

}  // namespace

// ---- opening

Result<std::shared_ptr<CaptureRecorder>, CaptureError> CaptureRecorder::open(const RecordingPlan& plan) {
  auto sources = RecordingSources::open(plan);
  if (!sources) return std::move(sources).error();
  auto files = CaptureFiles::create(plan.repository, plan.uuid);
  if (!files) return std::move(files).error();
  return std::shared_ptr<CaptureRecorder>(new CaptureRecorder(plan, *std::move(sources), *std::move(files)));
}

CaptureRecorder::CaptureRecorder(const RecordingPlan& plan, RecordingSources sources, CaptureFiles files)
    : plan_(plan),
      encoding_(completeEncoding(plan, sources.format())),
      clock_(sources.clock()),
      frame_seconds_(encoding_.frameSeconds()),
      wall_offset_(clock_.wallOffset()),
      folder_(std::move(files.folder)),
      journal_(std::move(files.journal)),
      marks_(journal_),
      queue_(encoding_.video.has_value(), clock_.realTime()),
      account_(plan.signal, *journal_, clock_.realTime() ? CaptureClock::now() : 0),
      sources_(std::move(sources)),
      movie_(std::make_unique<MovieOutput>(encoding_, std::move(files.movie), *journal_, patience_,
                                           [this](const CaptureError& error) { fail(error); })),
      cutter_(encoding_, CaptureClock::now(),
              {.marks = marks_,
               .journal = *journal_,
               .movie = *movie_,
               .convert = [this](const RawMedium& frame) { return convert(frame); },
               .heard = [this](const RawMedium& chunk) { account_.sound(chunk); },
               .silenced = [this](double t, double seconds) { account_.silence(t, seconds); },
               .soundComes = [this] { return !sound_away_; },
               .live = clock_.realTime(),
               .now = &CaptureClock::now}) {
  if (encoding_.video) converter_.emplace(encoding_.video->size);
  camera_size_ = sources_->format().size;
  journal_->capture(plan_.type, frame_seconds_, wall_offset_);
}

std::optional<CaptureError> CaptureRecorder::run(Reporter reporter, SoundReport soundReport) {
  RecordingSources sources = *sources_;
  {
    const std::lock_guard lock(mutex_);
    sound_report_ = std::move(soundReport);
  }
  sources.add(shared_from_this());
  if (encoding_.audio && !sources.hasMicrophone())
    soundLost({CaptureError::kDomain, kDeviceBusy, "the microphone is still being closed"});
  try {
    // Detached: this thread may hold the last reference to the recorder, and a thread cannot join itself.
    std::thread([self = shared_from_this(), reporter = std::move(reporter)] {
      self->record(reporter);
      // The encoder has freed tens of megabytes that the heap would otherwise keep.
      malloc_trim(0);
    }).detach();
  } catch (const std::system_error& problem) {
    sources.remove(this);
    const std::lock_guard lock(mutex_);
    sources_.reset();
    return CaptureError{CaptureError::kDomain, kEncoderFailed,
                        std::string("the recording thread could not be started: ") + problem.what()};
  }
  return std::nullopt;
}

// ---- commands

void CaptureRecorder::startFlow() {
  const std::lock_guard lock(mutex_);
  if (!sources_) return;
  flowing_ = true;
  sources_->start();
}

void CaptureRecorder::end(Ending how) {
  std::optional<double> now;  // absent for devices of "speed=max": their capture ends with the last mark
  const bool realTime = clock_.realTime();
  bool nothingComes = false;
  {
    const std::lock_guard lock(mutex_);
    if (!sources_) return;
    if (realTime) now = CaptureClock::now();
    nothingComes = !realTime && !flowing_;
  }
  if (!marks_.end(how, now)) return;
  // The recording ends with the first frame behind the end, which is due within a frame's time. A camera that
  // has not delivered any picture yet gets longer: a recording that is stopped at once still holds one.
  const auto patience = recorded_frames_ > 0 ? 1s : 3s;
  if (nothingComes) return queue_.hurry(MediaQueue::Clock::now());
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
  return sources_ ? timeNow() : closed_at_;
}

/// Running time now. Where the time is the devices' own it is as late as they have delivered.
double CaptureRecorder::timeNow() const {
  return clock_.realTime() ? CaptureClock::now() : media_time_.load();
}

double CaptureRecorder::runningTimeAt(double wallTime) const {
  const std::lock_guard lock(mutex_);
  return sources_ ? clock_.runningTimeAt(wallTime) : closed_at_;
}

std::int64_t CaptureRecorder::recordedMilliseconds() const {
  return std::llround(recorded_frames_ * frame_seconds_ * 1000);
}

std::optional<CaptureError> CaptureRecorder::error() const {
  const std::lock_guard lock(mutex_);
  return error_;
}

std::shared_ptr<CaptureSession> CaptureRecorder::session() const {
  const std::lock_guard lock(mutex_);
  return sources_ ? sources_->session() : nullptr;
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

void CaptureRecorder::onPicture(SampleHandle picture, double time) {
  GstBuffer* buffer = gst_sample_get_buffer(picture.get());
  GstCaps* caps = gst_sample_get_caps(picture.get());
  if (buffer == nullptr || caps == nullptr) return;
  media_time_ = time + frame_seconds_;
  queue_.pushVideo({BufferHandle(gst_buffer_ref(buffer)), time, CapsHandle(gst_caps_ref(caps))});
}

void CaptureRecorder::onSound(BufferHandle sound, double time) {
  heard_ = true;
  if (!encoding_.video) media_time_ = time + soundSeconds(sound.get());
  queue_.pushAudio({std::move(sound), time});
}

void CaptureRecorder::onSourceLost(SourceUse use, const CaptureError& error) {
  use.picture || !encoding_.video ? fail(error) : soundLost(error);
}

void CaptureRecorder::onSourceAway(SourceUse use, const CaptureError& error) {
  if (use.picture) return account_.cameraLost(timeNow());  // the frame before stays until it is back
  // A camera that goes on without its sound is no matter for the log where nobody wants that sound; here it
  // is wanted.
  if (plan_.camera == plan_.microphone)
    LMPLogMessage(nullptr, kLogError, "The recording is silent: %s", error.message.c_str());
  // Where there is only sound its loss is the end; but a microphone that has never been there is waited for.
  !encoding_.video&& heard_ ? fail(error) : soundLost(error);
}

void CaptureRecorder::onSourceBack(SourceUse use, double /*seconds*/) {
  if (use.picture) return account_.cameraBack(timeNow());
  account_.microphoneBack(timeNow());
  sound_away_ = false;
  SoundReport report;
  {
    const std::lock_guard lock(mutex_);
    report = sound_report_;
  }
  if (report) report(nullptr);
}

void CaptureRecorder::soundLost(const CaptureError& error) {
  if (sound_away_.exchange(true)) return;
  account_.microphoneLost(timeNow());
  SoundReport report;
  {
    const std::lock_guard lock(mutex_);
    report = sound_report_;
  }
  if (report) report(&error);
}

void CaptureRecorder::fail(const CaptureError& error) {
  double now = 0;
  {
    const std::lock_guard lock(mutex_);
    if (!error_) error_ = error;
    if (!sources_) return;
    now = timeNow();
  }
  marks_.end(Ending::stop, now);
  queue_.hurry(MediaQueue::Clock::now());  // nothing more will come
  patience_.set(Deadline::Clock::now() + kDiskPatience);
}

// ---- the recording thread

void CaptureRecorder::record(const Reporter& reporter) {
  guarded([this] { recordUntilTheEnd(); });
  RecordingSources sources = *sources_;  // only this thread resets them
  sources.remove(this);
  queue_.close();
  std::uint32_t frames = 0;
  guarded([this, &frames] { frames = closeMovie(); });
  // Whoever is to be told is held from before anybody can see that the capture has ended.
  const Report report = reporter();
  const std::optional<CaptureError> problem = error();
  tickAccount();  // what was lost since the last time
  account_.finish(endOfMedia(), sources.soundCorrection());
  publish(frames);
  movie_.reset();
  finished()->removeIfResolved();
  report({marks_.cancelled(), problem});
  sources.release();  // last: a driver may take its time to close
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
    MediaQueue::Batch batch = queue_.take(encoding_.video ? kForEver : kIdle);
    const bool inTime = batch.inTime;
    const bool nothing = batch.audio.empty() && batch.video.empty();
    feed(std::move(batch));
    tickAccount();
    if (nothing) cutter_.feedNothing(CaptureClock::now());
    checkLimits();
    more = inTime && !reachedEnd();
  }
  // What came while the last batch was being fed, before its device was lost.
  if (!marks_.worthless()) feed(queue_.take(0s));
}

void CaptureRecorder::tickAccount() { account_.tick(cutter_.frames().horizon(), clock_.wallOffset()); }

void CaptureRecorder::feed(MediaQueue::Batch batch) {
  account_.picturesDropped(batch.lostFrom, batch.lost);
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
  cutter_.close(endOfMedia());
  recorded_frames_ = cutter_.recordedFrames();
  movie_->close(cutter_.frames().frames(), cutter_.samples());
  if (queue_.dropped() > 0) movie_->fellBehind();
  return movie_->framesWritten(cutter_.frames().frames());
}

/// The frame as it is encoded.
BufferHandle CaptureRecorder::convert(const RawMedium& frame) {
  BufferHandle picture = converter_->convert(frame.buffer.get(), frame.caps.get());
  const auto change = converter_->formatChange();
  if (change && picture && frame.time - last_change_ > kChangeNotices) {
    last_change_ = frame.time;
    LMPLogMessage(nullptr, kLogNotice,
                  "The camera's picture has changed: %s; it is fitted into the recording's", change->c_str());
    const PictureSize size = recordedSize(frame.caps.get());
    if (size != std::exchange(camera_size_, size)) account_.sizeChanged(frame.time, size);
  }
  if (picture) account_.picture(picture.get(), encoding_.video->size, frame.time);
  noteReadable(frame.time, picture != nullptr);
  return picture;
}

/// The converter has told why a picture can't be read.
void CaptureRecorder::noteReadable(double t, bool readable) {
  if (!readable) account_.pictureLost(t);
  const auto news = unreadable_.note(t, readable);
  if (news == UnreadablePictures::News::again) {
    LMPLogMessage(nullptr, kLogNotice, "The camera's pictures can be read again after %.0f s",
                  unreadable_.lasted());
  } else if (news == UnreadablePictures::News::hopeless) {
    fail({CaptureError::kDomain, kDeviceFailed, "the camera's pictures can't be read"});
  }
}

void CaptureRecorder::publish(std::uint32_t totalFrames) {
  CaptureRecord record{
      .intact = true,
      .recordingType = recordingTypeOf(encoding_.video.has_value(), encoding_.audio.has_value()),
      .frameSeconds = frame_seconds_,
      .wallOffset = clock_.wallOffset(),
      .runs = cutter_.frames().runs(),
      .marks = marks_.close(),
      .movies = {}};
  const double closedAt = endOfMedia();
  const std::lock_guard lock(mutex_);
  closed_at_ = closedAt;
  finished_ = std::make_shared<FinishedCapture>(folder_, journal_, std::move(record), totalFrames);
  sources_.reset();
  sound_report_ = nullptr;
  finished_set_.notify_all();
}

double CaptureRecorder::endOfMedia() const { return std::min(marks_.endTime().value_or(0), timeNow()); }

}  // namespace lmx

// The recorder's thread: cuts raw media along the marks, feeds the encoder, closes the file.
#include <malloc.h>

#include <cerrno>
#include <cmath>
#include <cstring>
#include <exception>

#include "capture/capture_controller.h"
#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr std::size_t kMaxQueuedFrames = 90;    // three seconds: an encoder that far behind does not catch up
constexpr std::size_t kMaxQueuedChunks = 1000;  // ten seconds
constexpr std::size_t kFastQueue = 16;          // as fast as possible: the source waits for us
constexpr double kFastLead = 1.0;               // seconds that sound may be ahead of the picture then

}  // namespace

// ---- streaming threads

void CaptureController::onVideo(BufferHandle buffer, double runningTime) {
  std::unique_lock lock(mutex_);
  if (shut_down_ || !pipeline_) return;
  if (!pipeline_->realTime()) {
    changed_.wait(lock, [this] { return video_queue_.size() < kFastQueue || shut_down_; });
  } else if (video_queue_.size() >= kMaxQueuedFrames) {
    if (dropped_++ % 300 == 0) {
      LMPLogMessage(nullptr, kLogError, "The encoder can't keep up: %llu frames dropped so far",
                    static_cast<unsigned long long>(dropped_));
    }
    return;
  }
  video_queue_.push_back({std::move(buffer), runningTime});
  changed_.notify_all();
}

void CaptureController::onAudio(BufferHandle buffer, double runningTime) {
  std::unique_lock lock(mutex_);
  if (shut_down_ || !pipeline_) return;
  if (!pipeline_->realTime()) {
    changed_.wait(lock, [&] {
      return shut_down_ || (audio_queue_.size() < kFastQueue &&
                            (!has_video_ || runningTime < std::max(0.0, video_horizon_.load()) + kFastLead));
    });
  } else if (audio_queue_.size() >= kMaxQueuedChunks) {
    return;  // the cutter fills the hole with silence
  }
  audio_queue_.push_back({std::move(buffer), runningTime});
  // Sound waits for the picture anyway: only where there is none does it wake the recorder.
  if (!has_video_ || ending_ != Ending::no) changed_.notify_all();
}

void CaptureController::onCaptureError(const CaptureError& error) { fatal(error); }

void CaptureController::fatal(const CaptureError& error) {
  const std::lock_guard lock(mutex_);
  if (!error_) error_ = error;
  if (ending_ == Ending::no && pipeline_) {
    ending_ = Ending::stop;
    end_time_ = pipeline_->runningTime();
  }
  end_deadline_ = std::chrono::steady_clock::now();  // nothing more will come
  changed_.notify_all();
}

// ---- the recorder's thread

void CaptureController::run() {
  try {
    recordUntilTheEnd();
  } catch (const std::exception& problem) {  // no memory, no thread: what there is becomes the movie
    fatal({CaptureError::kDomain, kEncoderFailed, problem.what()});
  }
  finishCapture();
  // The encoder leaves tens of megabytes free in the heap, which by itself gives nothing back.
  malloc_trim(0);
}

void CaptureController::recordUntilTheEnd() {
  for (;;) {
    Items video;
    Items audio;
    const bool more = takeItems(video, audio);
    for (const Item& item : video) feedVideo(item);
    if (has_audio_) feedSound(audio);
    checkLimits();
    if (!more || reachedEnd()) break;
  }
}

/// Waits for something to do. @return false when the time for the end has run out.
bool CaptureController::takeItems(Items& video, Items& audio) {
  std::unique_lock lock(mutex_);
  const auto ready = [this] {
    return !video_queue_.empty() || (!has_video_ && !audio_queue_.empty()) ||
           (ending_ != Ending::no && !audio_queue_.empty());
  };
  bool inTime = true;
  while (inTime && !ready()) {
    if (ending_ == Ending::no || end_deadline_ == std::chrono::steady_clock::time_point::max()) {
      changed_.wait(lock);
    } else {
      inTime = changed_.wait_until(lock, end_deadline_) == std::cv_status::no_timeout;
    }
  }
  video.swap(video_queue_);
  audio.swap(audio_queue_);
  changed_.notify_all();
  return inTime;
}

/// Whether everything up to the end has been seen.
bool CaptureController::reachedEnd() const {
  auto& self = const_cast<CaptureController&>(*this);  // NOLINT: the mutex only
  const std::lock_guard lock(self.mutex_);
  if (ending_ == Ending::no) return false;
  if (ending_ == Ending::cancel && !marks_.othersPending({})) return true;
  if (std::chrono::steady_clock::now() >= end_deadline_) return true;
  const bool pictureDone = last_frame_time_ >= end_time_;
  if (!pictureDone) return false;
  if (!has_audio_ || frames_->runs().empty()) return true;
  const MovieRun& last = frames_->runs().back();
  const double soundEnd =
      pending_sound_.empty() ? -1e300 : pending_sound_.back().time + chunkSeconds(pending_sound_.back());
  const double needed = last.sessionTime + last.frames * frame_seconds_;
  return soundEnd >= needed ||
         sound_->position() >= std::llround(frames_->frames() * frame_seconds_ * audio_encoding_.sampleRate);
}

FrameDecision CaptureController::decide(double t) {
  bool wanted = false;
  bool key = false;
  {
    const std::lock_guard lock(mutex_);
    wanted = marks_.wanted(t) && (ending_ == Ending::no || t < end_time_);
    if (!wanted && frames_->frames() == 0) wanted = marks_.starving(t);
    key = marks_.startsBetween(last_frame_time_, t);
  }
  last_frame_time_ = t;
  const FrameDecision decision = frames_->decide(t, wanted, key);
  if (decision.beginsRun) {
    journal_->run(frames_->runs().back());
    journal_->sync();
  }
  video_horizon_ = frames_->horizon();
  return decision;
}

void CaptureController::feedVideo(const Item& item) {
  const FrameDecision decision = decide(item.time);
  if (!decision.take || !ensureEncoder()) return;
  // A place that no frame came for shows the next one: the frame rate stays constant.
  if (decision.beginsRun) next_place_ = decision.place;
  bool forceKey = decision.forceKey;
  for (; next_place_ <= decision.place; ++next_place_) {
    encoder_->pushVideo(item.buffer.get(), next_place_, forceKey);
    forceKey = false;
  }
  recorded_frames_ = frames_->frames();
}

/// Where there is only sound, frames of 10 ms stand for the picture: the same cuts, the same clock.
void CaptureController::feedVirtualFrames(double until) {
  while (*next_virtual_ + frame_seconds_ <= until + 1e-9) {
    const FrameDecision decision = decide(*next_virtual_);
    if (decision.take) recorded_frames_ = frames_->frames();
    *next_virtual_ += frame_seconds_;
  }
}

double CaptureController::chunkSeconds(const Item& item) const {
  const auto bytes = static_cast<double>(gst_buffer_get_size(item.buffer.get()));
  return bytes / sizeof(float) / audio_encoding_.channels / audio_encoding_.sampleRate;
}

void CaptureController::feedSound(Items& audio) {
  for (Item& item : audio) {
    if (!has_video_) {
      if (!next_virtual_) next_virtual_ = item.time;
      feedVirtualFrames(item.time + chunkSeconds(item));
    }
    pending_sound_.push_back(std::move(item));
  }
  while (!pending_sound_.empty() &&
         pending_sound_.front().time + chunkSeconds(pending_sound_.front()) <= frames_->horizon() + 1e-6) {
    cutChunk(pending_sound_.front());
    pending_sound_.pop_front();
  }
}

void CaptureController::cutChunk(const Item& chunk) {
  const auto count =
      static_cast<std::uint32_t>(std::llround(chunkSeconds(chunk) * audio_encoding_.sampleRate));
  const auto pieces = sound_->cut(chunk.time, count);
  if (!pieces.empty() && ensureEncoder()) pushPieces(chunk, pieces);
}

void CaptureController::pushPieces(const Item& chunk, const std::vector<SoundPiece>& pieces) {
  GstMapInfo map;
  if (gst_buffer_map(chunk.buffer.get(), &map, GST_MAP_READ) == FALSE) return;
  const auto* samples = reinterpret_cast<const float*>(map.data);
  const auto channels = static_cast<std::size_t>(audio_encoding_.channels);
  for (const SoundPiece& piece : pieces) {
    if (piece.silence > 0) encoder_->pushAudio(nullptr, piece.silence);
    if (piece.count > 0) encoder_->pushAudio(samples + piece.offset * channels, piece.count);
  }
  gst_buffer_unmap(chunk.buffer.get(), &map);
}

bool CaptureController::ensureEncoder() {
  if (encoder_) return true;
  if (!movie_) return false;  // failed before
  std::optional<VideoEncoding> video;
  if (has_video_) {
    const auto quality = settings_.videoCompressionOptions ? settings_.videoCompressionOptions->quality
                                                           : RecordingQuality::better;
    video = VideoEncoding{pipeline()->size(), frame_rate_, quality};
  }
  std::optional<AudioEncoding> audio;
  if (has_audio_) audio = audio_encoding_;
  const std::size_t tracks = (video ? 1 : 0) + (audio ? 1 : 0);
  writer_ = std::make_unique<MovieWriter>(std::move(*movie_), tracks, *journal_, [this](int error) {
    fatal({CaptureError::kDomain, error == ENOSPC ? kNoSpace : kWriteFailed,
           std::string("the movie can't be written any further: ") + std::strerror(error)});
  });
  movie_.reset();
  EncoderOutput output;
  output.onFormat = [this](std::uint32_t track, TrackFormat format) {
    writer_->setFormat(track, std::move(format));
  };
  output.onSample = [this](EncodedSample sample) { writer_->add(std::move(sample)); };
  output.onError = [this](const std::string& problem) {
    fatal({CaptureError::kDomain, kEncoderFailed, problem});
  };
  std::string problem;
  encoder_ = Encoder::create(video, audio, std::move(output), &problem);
  if (!encoder_) fatal({CaptureError::kDomain, kEncoderFailed, problem});
  return encoder_ != nullptr;
}

void CaptureController::checkLimits() {
  if (!max_duration_ ||
      recorded_frames_ * frame_seconds_ < std::chrono::duration<double>(*max_duration_).count())
    return;
  LMPLogMessage(nullptr, kLogNotice, "The recording has reached its maximal duration");
  max_duration_.reset();
  stopRecording();
}

void CaptureController::closeMedia() {
  frames_->close();
  if (sound_) {
    for (const Item& chunk : pending_sound_) cutChunk(chunk);
    const std::uint32_t missing = sound_->missingAtEnd();
    if (missing > 0 && encoder_) encoder_->pushAudio(nullptr, missing);
    if (sound_->corrected() > 0) {
      LMPLogMessage(nullptr, kLogInfo, "Sound was moved by %llu samples altogether to stay with the picture",
                    static_cast<unsigned long long>(sound_->corrected()));
    }
  }
  pending_sound_.clear();
  if (encoder_ && !encoder_->finish(sound_ ? sound_->position() : 0, 10s)) {
    LMPLogMessage(nullptr, kLogError, "The encoder did not come to its end; the movie holds what it gave");
  }
  encoder_.reset();
  if (!writer_) return;
  const int close_error = writer_->finish();
  if (const int error = writer_->syncError()) {
    const std::lock_guard lock(mutex_);
    if (!error_) {
      error_ = CaptureError{
          CaptureError::kDomain, kWriteFailed,
          std::string("the movie may be damaged, the disk has not kept all of it: ") + std::strerror(error)};
    }
  }
  if (close_error != 0) {
    LMPLogMessage(nullptr, kLogError,
                  "The movie could not be closed in order (%s); it stays readable as it is",
                  std::strerror(close_error));
  }
}

void CaptureController::finishCapture() {
  bool cancelled = false;
  bool discard = false;
  {
    const std::lock_guard lock(mutex_);
    cancelled = ending_ == Ending::cancel;
    discard = cancelled && !marks_.othersPending({});
  }
  CapturePipeline::Lease pipeline = this->pipeline();
  pipeline->removeConsumer(this);
  if (discard) {
    encoder_.reset();
    writer_.reset();
  } else {
    closeMedia();
  }
  std::uint32_t total = frames_->frames();
  if (writer_ && has_video_ && writer_->index().video() != nullptr) {
    // What a full disk or a failing encoder left out is not there to be copied.
    total =
        std::min<std::uint32_t>(total, static_cast<std::uint32_t>(writer_->index().video()->sizes.size()));
  }
  if (discard || !writer_ || !writer_->index().mediaEnd) total = 0;
  CaptureRecord record;
  std::shared_ptr<CaptureControllerDelegate> delegate;
  std::optional<CaptureError> error;
  {
    const std::lock_guard lock(mutex_);
    closed_at_ = pipeline->realTime() ? std::min(end_time_, pipeline->runningTime()) : end_time_;
    record = {.frameSeconds = frame_seconds_,
              .wallOffset = pipeline->wallOffset(),
              .runs = frames_->runs(),
              .marks = marks_,
              .movies = {}};
    record.recordingType = recordingTypeCode(has_video_, has_audio_);
    video_queue_.clear();
    audio_queue_.clear();
    finished_ = std::make_shared<FinishedCapture>(folder_, journal_, std::move(record), total);
    pipeline_ = nullptr;
    shut_down_ = true;
    delegate = delegate_.lock();
    error = error_;
    changed_.notify_all();
  }
  writer_.reset();
  movie_.reset();
  pipeline = nullptr;  // closes the devices unless somebody else has them
  finished_->removeIfResolved();
  if (!delegate) return;
  cancelled ? delegate->lmrCaptureDidCancel(error) : delegate->lmrCaptureDidComplete(error);
}

}  // namespace lmx

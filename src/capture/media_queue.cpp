// Limits of the queue, and who waits for what.
#include "capture/media_queue.h"

#include <algorithm>
#include <utility>

#include "platform/log.h"

namespace lmx {
namespace {

constexpr std::size_t kMaxFrames = 90;  // three seconds: an encoder this far behind will not catch up
constexpr std::size_t kMaxFrameBytes = 256U << 20;
constexpr double kMostSound = 20;       // seconds: a network camera may be away for ten
constexpr std::size_t kFastQueue = 16;  // not live: the source waits
constexpr double kFastLead = 1.0;       // seconds that sound may be ahead of the picture then
constexpr std::uint64_t kDropsPerLogLine = 300;

void reportDrop(std::uint64_t dropped) {
  if (dropped % kDropsPerLogLine != 1) return;
  LMPLogMessage(nullptr, kLogError, "The encoder can't keep up: %llu frames dropped so far",
                static_cast<unsigned long long>(dropped));
}

}  // namespace

void MediaQueue::pushVideo(RawMedium frame) {
  std::unique_lock lock(mutex_);
  if (!real_time_) {
    changed_.wait(lock, [this] { return closed_ || video_.size() < kFastQueue; });
  } else if (!closed_ && (video_.size() >= kMaxFrames || video_bytes_ >= kMaxFrameBytes)) {
    if (lost_++ == 0) lost_from_ = frame.time;
    const std::uint64_t dropped = ++dropped_;
    lock.unlock();
    reportDrop(dropped);
    return;
  }
  if (closed_) return;
  if (frame.buffer) video_bytes_ += gst_buffer_get_size(frame.buffer.get());
  video_.push_back(std::move(frame));
  changed_.notify_all();
}

void MediaQueue::pushAudio(RawMedium chunk) {
  std::unique_lock lock(mutex_);
  if (!real_time_) {
    changed_.wait(lock, [&] {
      const bool near = !has_video_ || chunk.time < std::max(0.0, picture_horizon_.load()) + kFastLead;
      return closed_ || (audio_.size() < kFastQueue && near);
    });
  } else if (!audio_.empty() && chunk.time - audio_.front().time > kMostSound) {
    return;  // the cutter fills the hole with silence
  }
  if (closed_) return;
  audio_.push_back(std::move(chunk));
  if (!has_video_ || deadline_) changed_.notify_all();
}

MediaQueue::Batch MediaQueue::take(Clock::duration idle) {
  Batch batch;
  const auto wake = Clock::now() + idle;
  std::unique_lock lock(mutex_);
  const auto ready = [this] {
    return !video_.empty() || (!audio_.empty() && (!has_video_ || deadline_.has_value()));
  };
  while (batch.inTime && !ready()) {
    const auto until = std::min(wake, deadline_.value_or(wake));
    if (changed_.wait_until(lock, until) == std::cv_status::no_timeout) continue;
    if (until == wake) break;
    batch.inTime = false;
  }
  video_bytes_ = 0;
  batch.video.swap(video_);
  batch.audio.swap(audio_);
  batch.lost = std::exchange(lost_, 0U);
  batch.lostFrom = lost_from_;
  changed_.notify_all();
  return batch;
}

void MediaQueue::hurry(Clock::time_point deadline) {
  const std::lock_guard lock(mutex_);
  deadline_ = deadline_ ? std::min(*deadline_, deadline) : deadline;
  changed_.notify_all();
}

std::uint64_t MediaQueue::dropped() const {
  const std::lock_guard lock(mutex_);
  return dropped_;
}

bool MediaQueue::expired() const {
  const std::lock_guard lock(mutex_);
  return deadline_ && Clock::now() >= *deadline_;
}

void MediaQueue::close() {
  const std::lock_guard lock(mutex_);
  closed_ = true;
  video_.clear();
  video_bytes_ = 0;
  audio_.clear();
  changed_.notify_all();
}

}  // namespace lmx

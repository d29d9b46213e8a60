// Cuts frames along the marks and sound along the frames.
#include "capture/media_cutter.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "platform/log.h"

namespace lmx {

namespace {

constexpr double kSoundPatience = 1.0;  // seconds that sound may lag behind the picture
constexpr double kSilencePiece = 1.0;   // seconds
constexpr double kNever = -1e300;

}  // namespace

MediaCutter::MediaCutter(const MovieEncoding& encoding, double begin, Surroundings surroundings)
    : has_video_(encoding.video.has_value()),
      begin_(begin),
      audio_(encoding.audio),
      around_(std::move(surroundings)),
      frames_(encoding.frameSeconds()) {
  if (audio_) sound_.emplace(frames_, static_cast<std::uint32_t>(audio_->sampleRate));
}

// ---- picture

FrameDecision MediaCutter::decide(double t) {
  const CaptureMarks::Wish wish = around_.marks.wishAt(last_frame_time_, t, frames_.frames() == 0);
  last_frame_time_ = t;
  if (!wish.wanted) prolong(t);
  const FrameDecision decision = frames_.decide(t, wish.wanted, wish.keyFrame);
  if (decision.beginsRun) {
    around_.journal.run(frames_.runs().back());
    (void)around_.journal.sync();  // the writer's next sync reports a disk that loses data
  }
  return decision;
}

/// The frame before a mark lasts until the mark, however long the camera takes for the next one.
void MediaCutter::prolong(double t) {
  if (frames_.runs().empty() || frames_.runs().back().closed) return;
  const auto until = around_.marks.wantedUntil(t);
  if (!until) return;
  frames_.prolong(*until);
  if (around_.movie.started()) recorded_frames_ = frames_.frames();
}

void MediaCutter::feedFrame(const RawMedium& frame) {
  const FrameDecision decision = decide(frame.time);
  if (!decision.take || !startMovie()) return;
  recorded_frames_ = frames_.frames();
  const BufferHandle picture = around_.convert(frame);
  // One that can't be read is a hole: the frame before it stays.
  if (picture)
    around_.movie.pushFrame(picture.get(), decision.place,
                            decision.forceKey || std::exchange(key_owed_, false));
  else
    key_owed_ = key_owed_ || decision.forceKey;
}

void MediaCutter::feedVirtualFrames(double until) {
  while (*next_virtual_ + frames_.frameSeconds() <= until + 1e-9) {
    if (decide(*next_virtual_).take) recorded_frames_ = frames_.frames();
    *next_virtual_ += frames_.frameSeconds();
  }
}

bool MediaCutter::startMovie() { return around_.movie.started() || around_.movie.start(); }

// ---- sound

double MediaCutter::chunkSeconds(const RawMedium& chunk) const {
  const auto bytes = static_cast<double>(gst_buffer_get_size(chunk.buffer.get()));
  return bytes / sizeof(float) / audio_->channels / audio_->sampleRate;
}

void MediaCutter::feedSound(RawMedia chunks) {
  if (!sound_) return;
  for (RawMedium& chunk : chunks) {
    if (!has_video_) {
      if (!next_virtual_) next_virtual_ = chunk.time;
      feedVirtualFrames(endOf(chunk));
    }
    pending_sound_.push_back(std::move(chunk));
  }
  while (!pending_sound_.empty() && endOf(pending_sound_.front()) <= frames_.horizon() + 1e-6) {
    cutChunk(pending_sound_.front());
    pending_sound_.pop_front();
  }
  if (!around_.live) return;
  const double awaited = awaitedUntil();
  fillSilence(around_.soundComes() ? awaited : frames_.horizon());
}

/// What lies before this has been waited for long enough. After a stall of the network seconds of pictures
/// come at once, and the sound beside them a moment later: it must have had a second to come in as well.
double MediaCutter::awaitedUntil() {
  const double now = around_.now ? around_.now() : frames_.horizon();
  progress_.push_back({now, frames_.horizon()});
  while (progress_.size() > 1 && progress_[1].at <= now - kSoundPatience) progress_.pop_front();
  const bool early = progress_.front().at > now - kSoundPatience;
  return early ? kNever : std::min(progress_.front().horizon, frames_.horizon() - kSoundPatience);
}

void MediaCutter::feedNothing(double now) {
  if (has_video_ || !sound_ || !around_.live) return;
  if (!next_virtual_) next_virtual_ = begin_;
  feedVirtualFrames(now - kSoundPatience);
  fillSilence(frames_.horizon());
}

/// Gives up waiting for sound before `until`.
void MediaCutter::fillSilence(double until) {
  while (const std::uint32_t missing = sound_->missingBefore(until)) {
    if (startMovie()) pushSilence(missing);
  }
}

/// In pieces: an hour of it must not be an hour of memory.
void MediaCutter::pushSilence(std::uint32_t samples) {
  if (samples == 0) return;
  const double rate = audio_->sampleRate;
  around_.silenced(frames_.timeAt(static_cast<double>(pushed_samples_) / rate), samples / rate);
  const auto most = static_cast<std::uint32_t>(kSilencePiece * rate);
  while (samples > 0) {
    const std::uint32_t piece = std::min(samples, most);
    pushSound(nullptr, piece);
    samples -= piece;
  }
}

void MediaCutter::pushSound(const float* samples, std::uint32_t count) {
  around_.movie.pushSound(samples, count);
  pushed_samples_ += count;
}

void MediaCutter::cutChunk(const RawMedium& chunk) {
  const auto count = static_cast<std::uint32_t>(std::llround(chunkSeconds(chunk) * audio_->sampleRate));
  const auto pieces = sound_->cut(chunk.time, count);
  if (pieces.empty() || !startMovie()) return;
  around_.heard(chunk);
  pushPieces(chunk, pieces);
}

void MediaCutter::pushPieces(const RawMedium& chunk, const std::vector<SoundPiece>& pieces) {
  GstMapInfo map;
  if (gst_buffer_map(chunk.buffer.get(), &map, GST_MAP_READ) == FALSE) return;
  const auto* samples = reinterpret_cast<const float*>(map.data);
  const auto channels = static_cast<std::size_t>(audio_->channels);
  for (const SoundPiece& piece : pieces) {
    pushSilence(piece.silence);
    if (piece.count > 0) pushSound(samples + piece.offset * channels, piece.count);
  }
  gst_buffer_unmap(chunk.buffer.get(), &map);
}

// ---- the end

bool MediaCutter::reaches(double end) const {
  if (last_frame_time_ < end) return false;
  if (!sound_ || !around_.soundComes() || frames_.runs().empty()) return true;
  const MovieRun& last = frames_.runs().back();
  const double needed = last.sessionTime + last.frames * frames_.frameSeconds();
  if (!pending_sound_.empty() && endOf(pending_sound_.back()) >= needed) return true;
  return sound_->position() >= std::llround(frames_.frames() * frames_.frameSeconds() * audio_->sampleRate);
}

void MediaCutter::close(double end) {
  if (around_.live) prolong(end);
  frames_.close();
  if (!sound_) return;
  for (const RawMedium& chunk : pending_sound_) cutChunk(chunk);
  pending_sound_.clear();
  const std::uint32_t missing = sound_->missingAtEnd();
  if (around_.movie.started()) pushSilence(missing);
  if (sound_->corrected() == 0) return;
  LMPLogMessage(nullptr, kLogInfo, "Sound was moved by %llu samples altogether to stay with the picture",
                static_cast<unsigned long long>(sound_->corrected()));
}

}  // namespace lmx

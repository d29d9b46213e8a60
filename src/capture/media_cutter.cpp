// Cuts frames along the marks and sound along the frames.
#include "capture/media_cutter.h"

#include <algorithm>
#include <cmath>

#include "platform/log.h"

namespace lmx {

MediaCutter::MediaCutter(const MovieEncoding& encoding, Surroundings surroundings)
    : has_video_(encoding.video.has_value()),
      audio_(encoding.audio),
      around_(std::move(surroundings)),
      frames_(encoding.frameSeconds()) {
  if (audio_) sound_.emplace(frames_, static_cast<std::uint32_t>(audio_->sampleRate));
}

// ---- picture

FrameDecision MediaCutter::decide(double t) {
  const CaptureMarks::Wish wish = around_.marks.wishAt(last_frame_time_, t, frames_.frames() == 0);
  last_frame_time_ = t;
  const FrameDecision decision = frames_.decide(t, wish.wanted, wish.keyFrame);
  if (decision.beginsRun) {
    around_.journal.run(frames_.runs().back());
    (void)around_.journal.sync();  // the writer's next sync reports a disk that loses data
  }
  return decision;
}

void MediaCutter::feedFrame(const RawMedium& frame) {
  const FrameDecision decision = decide(frame.time);
  if (!decision.take || !startMovie()) return;
  around_.movie.pushFrame(frame.buffer.get(), decision.place, decision.forceKey);
  recorded_frames_ = frames_.frames();
}

void MediaCutter::feedVirtualFrames(double until) {
  while (*next_virtual_ + frames_.frameSeconds() <= until + 1e-9) {
    if (decide(*next_virtual_).take) recorded_frames_ = frames_.frames();
    *next_virtual_ += frames_.frameSeconds();
  }
}

bool MediaCutter::startMovie() {
  return around_.movie.started() || around_.movie.start(around_.pictureSize());
}

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
}

void MediaCutter::cutChunk(const RawMedium& chunk) {
  const auto count = static_cast<std::uint32_t>(std::llround(chunkSeconds(chunk) * audio_->sampleRate));
  const auto pieces = sound_->cut(chunk.time, count);
  if (!pieces.empty() && startMovie()) pushPieces(chunk, pieces);
}

void MediaCutter::pushPieces(const RawMedium& chunk, const std::vector<SoundPiece>& pieces) {
  GstMapInfo map;
  if (gst_buffer_map(chunk.buffer.get(), &map, GST_MAP_READ) == FALSE) return;
  const auto* samples = reinterpret_cast<const float*>(map.data);
  const auto channels = static_cast<std::size_t>(audio_->channels);
  for (const SoundPiece& piece : pieces) {
    if (piece.silence > 0) around_.movie.pushSound(nullptr, piece.silence);
    if (piece.count > 0) around_.movie.pushSound(samples + piece.offset * channels, piece.count);
  }
  gst_buffer_unmap(chunk.buffer.get(), &map);
}

// ---- the end

bool MediaCutter::reaches(double end) const {
  if (last_frame_time_ < end) return false;
  if (!sound_ || frames_.runs().empty()) return true;
  const MovieRun& last = frames_.runs().back();
  const double needed = last.sessionTime + last.frames * frames_.frameSeconds();
  if (!pending_sound_.empty() && endOf(pending_sound_.back()) >= needed) return true;
  return sound_->position() >= std::llround(frames_.frames() * frames_.frameSeconds() * audio_->sampleRate);
}

void MediaCutter::close() {
  frames_.close();
  if (!sound_) return;
  for (const RawMedium& chunk : pending_sound_) cutChunk(chunk);
  pending_sound_.clear();
  const std::uint32_t missing = sound_->missingAtEnd();
  if (missing > 0 && around_.movie.started()) around_.movie.pushSound(nullptr, missing);
  if (sound_->corrected() == 0) return;
  LMPLogMessage(nullptr, kLogInfo, "Sound was moved by %llu samples altogether to stay with the picture",
                static_cast<unsigned long long>(sound_->corrected()));
}

}  // namespace lmx

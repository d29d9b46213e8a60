// Holds back, places and resamples a microphone's sound.
#include "capture/source/steady_sound.h"

#include <algorithm>
#include <cmath>
#include <span>
#include <utility>

#include "platform/log.h"

namespace lmx {
namespace {

/// Seconds of sound that are held at most.
constexpr double kMostHeld = 4;
/// Seconds of sound for which the speed is set at once.
constexpr double kPieceSeconds = 0.050;
/// Seconds in which an error of place would be made up for, were it not for the limit.
constexpr double kCorrectionSeconds = 2;
/// The change of speed sets in over this time: pitch glides, it does not step.
constexpr double kGlideSeconds = 1;
/// Greatest change of speed, which is a twelfth of a semitone.
constexpr double kGreatestCorrection = 5000e-6;
/// Seconds of error that are made up for without a jump.
constexpr double kMostBehind = 0.1;
/// More jumps than these within a minute are no accident.
constexpr std::uint32_t kJumpsAMinute = 10;

}  // namespace

SteadySound::SteadySound(int sampleRate, int channels)
    : sample_rate_(sampleRate),
      channels_(static_cast<std::size_t>(channels)),
      resampler_(sampleRate, channels) {}

std::vector<SteadySound::Chunk> SteadySound::feed(BufferHandle buffer, double arrival) {
  std::vector<Chunk> chunks;
  const std::int64_t frames = copySamples(buffer.get());
  if (frames == 0) return chunks;
  heard_ += frames;
  boundHeld();
  if (!plausible(arrival)) return chunks;
  undecided_.push_back({.heard = seconds(heard_), .arrival = arrival});
  std::size_t next = undecided_.size() - 1;
  while (next < undecided_.size()) {
    const SoundStamp stamp = undecided_[next++];
    const ArrivalJudge::Finding finding = judge(stamp);
    if (finding == ArrivalJudge::Finding::undecided) continue;
    if (finding == ArrivalJudge::Finding::jump) jump(stamp.arrival, chunks);
    release(finding == ArrivalJudge::Finding::jump ? judge_.punctual() : stamp, chunks);
    next = 0;  // what is behind a jump is judged by the new clock
  }
  return chunks;
}

ArrivalJudge::Finding SteadySound::judge(const SoundStamp& stamp) {
  const ArrivalJudge::Finding finding = judge_.judge(stamp);
  const bool astray = part_open_ && std::abs(behind()) > kMostBehind;
  return finding == ArrivalJudge::Finding::inTime && astray ? judge_.startAgain(stamp) : finding;
}

std::int64_t SteadySound::heldFrames() const { return static_cast<std::int64_t>(held_.size() / channels_); }

std::int64_t SteadySound::copySamples(GstBuffer* buffer) {
  GstMapInfo map;
  if (buffer == nullptr || gst_buffer_map(buffer, &map, GST_MAP_READ) == FALSE) return 0;
  const std::size_t frames = map.size / sizeof(float) / channels_;
  const auto* samples = reinterpret_cast<const float*>(map.data);
  held_.insert(held_.end(), samples, samples + frames * channels_);
  gst_buffer_unmap(buffer, &map);
  return static_cast<std::int64_t>(frames);
}

/// Sound whose stamp goes back waits for the next one: a clock can be wrong once.
bool SteadySound::plausible(double arrival) {
  return std::isfinite(arrival) && arrival >= std::exchange(last_arrival_, arrival);
}

void SteadySound::boundHeld() {
  const std::int64_t excess = heldFrames() - std::llround(kMostHeld * sample_rate_);
  if (excess <= 0) return;
  dropHeld(excess);
  part_open_ = false;
}

void SteadySound::dropHeld(std::int64_t frames) {
  const auto samples = std::min(held_.size(), static_cast<std::size_t>(frames) * channels_);
  held_.erase(held_.begin(), held_.begin() + static_cast<std::ptrdiff_t>(samples));
}

/// Gives out what the filter still holds of the sound before the gap.
void SteadySound::jump(double arrival, std::vector<Chunk>& chunks) {
  if (part_time_ > -1e300) countJump(arrival);
  if (part_open_) give(resampler_.drain(), chunks);
  part_open_ = false;
}

/// Gives out what is held up to `last`.
void SteadySound::release(const SoundStamp& last, std::vector<Chunk>& chunks) {
  std::erase_if(undecided_, [&last](const SoundStamp& stamp) { return stamp.heard <= last.heard; });
  if (!part_open_ && !beginPart()) return;
  const std::int64_t behindIt = heard_ - std::llround(last.heard * sample_rate_);
  const auto frames = static_cast<std::size_t>(std::max<std::int64_t>(heldFrames() - behindIt, 0));
  const std::span<const float> held(held_.data(), frames * channels_);
  const std::size_t most = static_cast<std::size_t>(kPieceSeconds * sample_rate_ + 1) * channels_;
  for (std::size_t at = 0; at < held.size(); at += most) {
    const auto piece = held.subspan(at, std::min(most, held.size() - at));
    adjustRatio(piece.size() / channels_);
    give(resampler_.push(piece), chunks);
  }
  dropHeld(static_cast<std::int64_t>(frames));
}

/// Sound that follows a jump must not reach into what was given out before it.
bool SteadySound::beginPart() {
  const double given = part_time_ + seconds(part_frames_);
  const double early = given - clock().timeAt(seconds(heard_ - heldFrames()));
  if (early > 0) dropHeld(static_cast<std::int64_t>(std::min(std::ceil(early * sample_rate_), 1e12)));
  if (held_.empty()) return false;
  resampler_.restart();
  part_begin_ = heard_ - heldFrames();
  part_time_ = std::max(given, clock().timeAt(seconds(part_begin_)));
  part_frames_ = 0;
  ratio_ = 1 / clock().secondsPerSecond();
  part_open_ = true;
  return true;
}

double SteadySound::behind() const {
  const double heard = seconds(part_begin_) + resampler_.position() / sample_rate_;
  return clock().timeAt(heard) - (part_time_ + seconds(part_frames_));
}

/// Sets the ratio for the next `frames`.
void SteadySound::adjustRatio(std::size_t frames) {
  const double correction =
      std::clamp(behind() / kCorrectionSeconds, -kGreatestCorrection, kGreatestCorrection);
  const double wanted = 1 / clock().secondsPerSecond() - correction;
  ratio_ += (wanted - ratio_) * std::min(1.0, static_cast<double>(frames) / sample_rate_ / kGlideSeconds);
  resampler_.setRatio(ratio_);
}

void SteadySound::give(BufferHandle buffer, std::vector<Chunk>& chunks) {
  if (!buffer) return;
  const std::size_t frames = gst_buffer_get_size(buffer.get()) / sizeof(float) / channels_;
  chunks.push_back({std::move(buffer), part_time_ + seconds(part_frames_)});
  part_frames_ += static_cast<std::int64_t>(frames);
}

void SteadySound::countJump(double arrival) {
  ++jumps_;
  if (arrival - jumps_since_ > 60 || arrival < jumps_since_) {
    jumps_since_ = arrival;
    recent_jumps_ = 0;
  }
  if (++recent_jumps_ <= kJumpsAMinute || warned_) return;
  warned_ = true;
  LMPLogMessage(
      nullptr, kLogWarning,
      "The microphone's sound does not keep time: it comes too fast, too slowly or in parts; parts of it "
      "will be missing in recordings");
}

}  // namespace lmx

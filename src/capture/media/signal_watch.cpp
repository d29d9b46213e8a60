// Looks at pictures and sound.
#include "capture/media/signal_watch.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <utility>

#include "support/format.h"

namespace lmx {
namespace {

constexpr std::size_t kColumns = 160;
constexpr std::size_t kRows = 90;
/// One point in so many may be brighter than black: hot pixels.
constexpr std::size_t kBrightShare = 200;
/// So many samples in a row at the limit are no coincidence.
constexpr int kClippedInARow = 3;
/// People who talk too loudly pause for breath.
constexpr double kBreath = 3;
/// Pictures and sound are judged once in that many seconds.
constexpr double kInterval = 1;

float amplitude(double decibels) { return static_cast<float>(std::pow(10, decibels / 20)); }

std::vector<std::uint8_t> pointsOf(const PictureLuma& luma) {
  std::vector<std::uint8_t> points;
  if (luma.width == 0 || luma.height == 0) return points;
  points.reserve(kColumns * kRows);
  for (std::size_t row = 0; row < kRows; ++row) {
    const std::uint8_t* line = luma.data + (2 * row + 1) * luma.height / (2 * kRows) * luma.stride;
    for (std::size_t column = 0; column < kColumns; ++column) {
      points.push_back(line[(2 * column + 1) * luma.width / (2 * kColumns)]);
    }
  }
  return points;
}

void append(SignalEvents& events, const std::optional<SignalEvent>& event) {
  if (event) events.push_back(*event);
}

}  // namespace

std::string signalText(const SignalEvent& event) {
  struct Texts {
    const char *begun, *over, *advice;
  };
  static constexpr std::array<Texts, 4> kTexts{{
      {"The microphone has been silent", "The microphone was silent", "; is it muted?"},
      {"The sound has been too loud and cut off", "The sound was too loud and cut off",
       "; turn the microphone down"},
      {"The picture has been black", "The picture was black", "; is the lens covered?"},
      {"The picture has not changed", "The picture did not change", "; is the camera frozen?"},
  }};
  const Texts& texts = kTexts.at(static_cast<std::size_t>(event.trouble));
  return string_with_format("%s for %.0f seconds%s", event.begins ? texts.begun : texts.over, event.seconds,
                            event.begins ? texts.advice : ", and is all right again");
}

std::optional<SignalEvent> TroubleSpell::look(bool seen, double from, double to) {
  if (seen) {
    if (!since_) since_ = from;
    last_seen_ = to;
    if (told_ || to - *since_ < patience_) return std::nullopt;
    told_ = true;
    return SignalEvent{trouble_, true, to - *since_};
  }
  if (!since_ || to - last_seen_ <= grace_) return std::nullopt;
  const SignalEvent over{trouble_, false, last_seen_ - *since_};
  const bool told = told_;
  told_ = false;
  since_.reset();
  return told ? std::optional(over) : std::nullopt;
}

SignalWatch::SignalWatch(const SignalThresholds& thresholds)
    : thresholds_(thresholds),
      silence_(amplitude(thresholds.silenceDecibels.value_or(0))),
      clipping_(amplitude(thresholds.clippingDecibels.value_or(0))),
      silence_spell_(SignalTrouble::silence, thresholds.seconds, 0),
      clipping_spell_(SignalTrouble::clipping, thresholds.seconds, kBreath),
      black_spell_(SignalTrouble::black, thresholds.seconds, 0),
      frozen_spell_(SignalTrouble::frozen, thresholds.seconds, 0) {}

// ---- picture

bool SignalWatch::wantsPicture(double t) const {
  return thresholds_.seconds > 0 && (thresholds_.blackLevel || thresholds_.frozenDifference) &&
         t >= last_picture_ + kInterval;
}

SignalEvents SignalWatch::picture(const PictureLuma& luma, double t) {
  SignalEvents events;
  if (!wantsPicture(t)) return events;
  const std::vector<std::uint8_t> before = std::exchange(points_, pointsOf(luma));
  const double from = before.empty() ? t : last_picture_;
  last_picture_ = t;
  if (points_.empty()) return events;
  const bool black = looksBlack();
  append(events, black_spell_.look(black, t, t));
  append(events, frozen_spell_.look(!black && looksFrozen(before), from, t));
  return events;
}

bool SignalWatch::looksBlack() const {
  if (!thresholds_.blackLevel) return false;
  const auto bright =
      static_cast<std::size_t>(std::count_if(points_.begin(), points_.end(), [this](std::uint8_t point) {
        return point > *thresholds_.blackLevel;
      }));
  return bright * kBrightShare <= points_.size();
}

bool SignalWatch::looksFrozen(const std::vector<std::uint8_t>& before) const {
  if (!thresholds_.frozenDifference) return false;
  return std::equal(
      points_.begin(), points_.end(), before.begin(), before.end(),
      [this](std::uint8_t a, std::uint8_t b) { return std::abs(a - b) <= *thresholds_.frozenDifference; });
}

// ---- sound

SignalEvents SignalWatch::sound(std::span<const float> samples, int channels, int sampleRate, double t) {
  if (thresholds_.seconds <= 0 || channels <= 0 || sampleRate <= 0) return {};
  if (!second_) second_ = Second{.begin = t};
  float peak = 0;
  for (const float sample : samples) peak = std::max(peak, std::abs(sample));
  second_->peak = std::max(second_->peak, peak);
  const auto width = static_cast<std::size_t>(channels);
  if (peak >= clipping_ && !second_->clipped) second_->clipped = clips(samples, width);
  const std::size_t frames = samples.size() / width;
  const double end = t + static_cast<double>(frames) / sampleRate;
  return end - second_->begin < kInterval ? SignalEvents{} : judgeSecond(end);
}

bool SignalWatch::clips(std::span<const float> samples, std::size_t channels) const {
  for (std::size_t channel = 0; channel < channels; ++channel) {
    int row = 0;
    for (std::size_t i = channel; i < samples.size(); i += channels) {
      row = std::abs(samples[i]) >= clipping_ ? row + 1 : 0;
      if (row >= kClippedInARow) return true;
    }
  }
  return false;
}

SignalEvents SignalWatch::judgeSecond(double end) {
  SignalEvents events;
  const bool silent = thresholds_.silenceDecibels && second_->peak <= silence_;
  const bool clipped = thresholds_.clippingDecibels && second_->clipped;
  append(events, silence_spell_.look(silent, second_->begin, end));
  append(events, clipping_spell_.look(clipped, second_->begin, end));
  second_.reset();
  return events;
}

}  // namespace lmx

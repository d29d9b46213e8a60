// Notices a picture or a sound that nobody can want: black, frozen, silent, cut off. Pure.
#pragma once
#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "capture/api/signal_thresholds.h"

namespace lmx {

/// The luma of an I420 picture, limited range; a loan for the call.
struct PictureLuma {
  const std::uint8_t* data = nullptr;
  std::size_t stride = 0;  ///< bytes from one row to the next
  std::size_t width = 0;
  std::size_t height = 0;
};

enum class SignalTrouble { silence, clipping, black, frozen };

/// Trouble has begun to be told, or is over.
struct SignalEvent {
  SignalTrouble trouble = SignalTrouble::silence;
  bool begins = false;
  double seconds = 0;  ///< for which it has lasted
  bool operator==(const SignalEvent&) const = default;
};
using SignalEvents = std::vector<SignalEvent>;

/// One sentence for the log: a warning when it begins, a notice when it ends.
std::string signalText(const SignalEvent& event);

/// One kind of trouble: seen or not, second by second.
class TroubleSpell {
 public:
  /// @param patience  seconds it lasts before it is told
  /// @param grace  seconds without it that don't end it
  TroubleSpell(SignalTrouble trouble, double patience, double grace)
      : trouble_(trouble), patience_(patience), grace_(grace) {}
  /// It was, or was not, seen from running time `from` to `to`, seconds.
  [[nodiscard]] std::optional<SignalEvent> look(bool seen, double from, double to);

 private:
  SignalTrouble trouble_;
  double patience_;
  double grace_;
  std::optional<double> since_;
  double last_seen_ = 0;
  bool told_ = false;
};

/// Looks at one picture a second, at a grid of 160 by 90 points, and at all samples. Trouble is told when it
/// has lasted for the time in the thresholds, and when it is over. A black picture is not told as frozen,
/// too. Costs less than 0.1 % of a core. Not thread-safe. Where the recorder feeds its cutter:
///
///   if (watch_.wantsPicture(t)) tell(watch_.picture({y, stride, width, height}, t));
///   tell(watch_.sound(samples, channels, sampleRate, t));
class SignalWatch {
 public:
  explicit SignalWatch(const SignalThresholds& thresholds);

  /// Whether a picture of running time `t` would be looked at; times ascend.
  [[nodiscard]] bool wantsPicture(double t) const;
  SignalEvents picture(const PictureLuma& luma, double t);
  /// @param samples  interleaved
  /// @param t  running time of the first one, seconds
  SignalEvents sound(std::span<const float> samples, int channels, int sampleRate, double t);

 private:
  /// The sound of a second.
  struct Second {
    double begin = 0;
    float peak = 0;
    bool clipped = false;
  };
  [[nodiscard]] bool looksBlack() const;
  [[nodiscard]] bool looksFrozen(const std::vector<std::uint8_t>& before) const;
  [[nodiscard]] bool clips(std::span<const float> samples, std::size_t channels) const;
  SignalEvents judgeSecond(double end);

  const SignalThresholds thresholds_;
  const float silence_;   ///< amplitude
  const float clipping_;  ///< amplitude
  TroubleSpell silence_spell_, clipping_spell_, black_spell_, frozen_spell_;
  std::vector<std::uint8_t> points_;  ///< of the picture that was looked at last
  double last_picture_ = -1e300;
  std::optional<Second> second_;
};

}  // namespace lmx

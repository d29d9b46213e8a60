// From where on the signal of a camera or a microphone counts as trouble.
#pragma once
#include <optional>

namespace lmx {

/// Absent: that kind of trouble is not watched for.
struct SignalThresholds {
  double seconds = 10;  ///< it lasts that long before it is told; 0: nothing is watched
  std::optional<double> silenceDecibels = -80;    ///< of full scale; sound that never exceeds it is silence
  std::optional<double> clippingDecibels = -0.1;  ///< of full scale; sound that reaches it is cut off
  std::optional<int> blackLevel = 24;  ///< luma, 16 being black; a picture that hardly exceeds it is black
  /// Luma; a picture that nowhere differs more from the one a second before has not changed. 0: equal
  /// pictures only, because the noise of any camera makes them differ. A still slide from a capture card is
  /// equal, too.
  std::optional<int> frozenDifference = 0;
  bool operator==(const SignalThresholds&) const = default;
};

}  // namespace lmx

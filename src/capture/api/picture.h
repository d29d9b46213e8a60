// Size and rate of pictures.
#pragma once

namespace lmx {

struct PictureSize {
  int width = 1280;
  int height = 720;
};

/// A frame rate as a fraction: 29.97 is 30000/1001, whole numbers n/1, others in thousandths.
struct FrameRate {
  int numerator = 30;
  int denominator = 1;
  [[nodiscard]] double frameSeconds() const { return static_cast<double>(denominator) / numerator; }
  bool operator==(const FrameRate&) const = default;
};
FrameRate frameRateFrom(double framesPerSecond);

}  // namespace lmx

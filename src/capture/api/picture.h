// Size and rate of pictures.
#pragma once
#include <optional>
#include <string>

namespace lmx {

struct PictureSize {
  int width = 1280;
  int height = 720;
  bool operator==(const PictureSize&) const = default;
};
/// The largest picture that is recorded.
inline constexpr PictureSize kFullHD{1920, 1080};
/// What a camera is asked for at most.
struct PictureLimits {
  PictureSize size = kFullHD;
  double rate = 30;  ///< frames a second
};
/// Reads a size such as "1280x720"; nothing when it is none, or not within 64x64 and full HD.
std::optional<PictureSize> pictureSizeFrom(const std::string& text);

/// The size in which a picture of `width` x `height` square pixels is recorded: no larger than `limit` with
/// the shape kept, even numbers, at least 16.
PictureSize fittedSize(double width, double height, PictureSize limit);

/// A frame rate as a fraction: 29.97 is 30000/1001, whole numbers n/1, others in thousandths.
struct FrameRate {
  int numerator = 30;
  int denominator = 1;
  [[nodiscard]] double frameSeconds() const { return static_cast<double>(denominator) / numerator; }
  bool operator==(const FrameRate&) const = default;
};
FrameRate frameRateFrom(double framesPerSecond);

}  // namespace lmx

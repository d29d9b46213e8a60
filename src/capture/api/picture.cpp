// Turns frame rates into fractions, and texts into sizes.
#include "capture/api/picture.h"

#include <algorithm>
#include <charconv>
#include <cmath>

namespace lmx {

std::optional<PictureSize> pictureSizeFrom(const std::string& text) {
  PictureSize size;
  const char* end = text.data() + text.size();
  const auto width = std::from_chars(text.data(), end, size.width);
  if (width.ec != std::errc() || width.ptr == end || *width.ptr != 'x') return std::nullopt;
  const auto height = std::from_chars(width.ptr + 1, end, size.height);
  if (height.ec != std::errc() || height.ptr != end) return std::nullopt;
  if (size.width < 64 || size.height < 64 || size.width > kFullHD.width || size.height > kFullHD.height)
    return std::nullopt;
  return size;
}

PictureSize fittedSize(double width, double height, PictureSize limit) {
  const double scale = std::min({1.0, limit.width / width, limit.height / height});
  const auto even = [scale](double side) {
    return std::max(16, 2 * static_cast<int>(std::lround(side * scale / 2)));
  };
  return {even(width), even(height)};
}

FrameRate frameRateFrom(double framesPerSecond) {
  const double whole = std::round(framesPerSecond);
  if (std::abs(framesPerSecond - whole) < 1e-6) return {static_cast<int>(whole), 1};
  // The television rates: 23.976, 29.97, 59.94.
  const double up = std::ceil(framesPerSecond);
  if (std::abs(framesPerSecond - up * 1000.0 / 1001.0) < 5e-3) return {static_cast<int>(up) * 1000, 1001};
  return {static_cast<int>(std::lround(framesPerSecond * 1000)), 1000};
}

}  // namespace lmx

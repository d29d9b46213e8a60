// Turns frame rates into fractions.
#include "capture/api/picture.h"

#include <cmath>

namespace lmx {

FrameRate frameRateFrom(double framesPerSecond) {
  const double whole = std::round(framesPerSecond);
  if (std::abs(framesPerSecond - whole) < 1e-6) return {static_cast<int>(whole), 1};
  // The television rates: 23.976, 29.97, 59.94.
  const double up = std::ceil(framesPerSecond);
  if (std::abs(framesPerSecond - up * 1000.0 / 1001.0) < 5e-3) return {static_cast<int>(up) * 1000, 1001};
  return {static_cast<int>(std::lround(framesPerSecond * 1000)), 1000};
}

}  // namespace lmx

// The two audio levels of a status reply.
#include "control/protocol/audio_levels.h"

#include <cmath>

namespace lmx {

AudioLevels audioLevels(const std::vector<double>& decibels) {
  if (decibels.empty()) return {};
  const auto linear = [](double level) { return static_cast<float>(20.0 * std::pow(10.0, 0.05 * level)); };
  const float left = linear(decibels[0]);
  return {left, decibels.size() > 1 ? linear(decibels[1]) : left};
}

}  // namespace lmx

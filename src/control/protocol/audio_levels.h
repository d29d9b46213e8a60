// The two audio levels of a status reply.
#pragma once
#include <vector>

namespace lmx {

/// Linear levels; 20.0 is full scale (0 dB).
struct AudioLevels {
  float left = 0;
  float right = 0;
};

/// @param decibels  one level a channel. None: both 0; one: both that channel; more: the first two.
AudioLevels audioLevels(const std::vector<double>& decibels);

}  // namespace lmx

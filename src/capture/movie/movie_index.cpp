// Adds samples to an index, and totals it.
#include "capture/movie/movie_index.h"

#include <algorithm>

namespace lmx {

void TrackIndex::addSample(std::uint32_t size, std::uint32_t duration, bool sync) {
  if (format.isVideo && sync) syncSamples.push_back(static_cast<std::uint32_t>(sizes.size()));
  sizes.push_back(size);
  if (durations.empty() || durations.back().duration != duration) durations.push_back({0, duration});
  ++durations.back().count;
  totalDuration += duration;
  ++chunks.back().samples;
}

const TrackIndex* MovieIndex::video() const {
  const auto found =
      std::find_if(tracks.begin(), tracks.end(), [](const auto& t) { return t.format.isVideo; });
  return found == tracks.end() ? nullptr : &*found;
}

const TrackIndex* MovieIndex::audio() const {
  const auto found =
      std::find_if(tracks.begin(), tracks.end(), [](const auto& t) { return !t.format.isVideo; });
  return found == tracks.end() ? nullptr : &*found;
}

double MovieIndex::seconds() const {
  double longest = 0;
  for (const auto& track : tracks) longest = std::max(longest, track.seconds());
  return longest;
}

}  // namespace lmx

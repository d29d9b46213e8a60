// Small movies whose samples carry their own numbers.
#pragma once
#include <string>
#include <vector>

#include "capture/movie/growing_movie.h"

namespace lmx::testing {

/// A picture of 30 frames a second and a stereo sound.
std::vector<TrackFormat> sampleFormats();

/// Fragment `n`: 15 frames of half a second and their sound; every sample is filled with its own number.
std::vector<EncodedSample> sampleFragment(std::uint32_t n);

/// Writes a movie of so many fragments; without `finish` as a killed process leaves it.
void writeSampleMovie(const std::string& path, std::uint32_t fragments, bool finish);

/// First byte of each sample of a track of `path`, where the index places it.
std::vector<int> firstBytes(const std::string& path, const TrackIndex& track);

}  // namespace lmx::testing

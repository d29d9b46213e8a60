// Writing small movies.
#include "tests/unit/capture/movie/sample_movies.h"

#include <gtest/gtest.h>

#include <fstream>

#include "capture/movie/sample_description.h"

namespace lmx::testing {

std::vector<TrackFormat> sampleFormats() {
  const Bytes config{1, 100, 0, 40, 0xFF, 0xE1, 0, 0};
  return {{.isVideo = true,
           .timescale = 30000,
           .width = 64,
           .height = 36,
           .sampleDescription = videoSampleDescription(64, 36, config)},
          {.timescale = 48000, .sampleDescription = audioSampleDescription(48000, 2, Bytes{0x11, 0x90})}};
}

std::vector<EncodedSample> sampleFragment(std::uint32_t n) {
  std::vector<EncodedSample> samples;
  for (std::uint32_t i = 0; i < 15; ++i) {
    const auto number = static_cast<std::uint8_t>(n * 15 + i);
    samples.push_back({.track = 0, .data = Bytes(20 + i, number), .duration = 1000, .sync = i == 0});
  }
  for (std::uint32_t i = 0; i < 23; ++i) {
    samples.push_back({.track = 1, .data = Bytes(7, static_cast<std::uint8_t>(128 + n)), .duration = 1024});
  }
  return samples;
}

void writeSampleMovie(const std::string& path, std::uint32_t fragments, bool finish) {
  GrowingMovie movie;
  ASSERT_EQ(movie.create(path), 0);
  ASSERT_EQ(movie.begin(sampleFormats()), 0);
  for (std::uint32_t n = 0; n < fragments; ++n) ASSERT_EQ(movie.append(sampleFragment(n)), 0);
  if (finish) {
    ASSERT_EQ(movie.finish(), 0);
  }
}

std::vector<int> firstBytes(const std::string& path, const TrackIndex& track) {
  std::ifstream file(path, std::ios::binary);
  std::vector<int> bytes;
  std::size_t sample = 0;
  for (const Chunk& chunk : track.chunks) {
    std::uint64_t at = chunk.offset;
    for (std::uint32_t i = 0; i < chunk.samples; ++i, ++sample) {
      file.seekg(static_cast<std::streamoff>(at));
      bytes.push_back(file.get());
      at += track.sizes[sample];
    }
  }
  return bytes;
}

}  // namespace lmx::testing

// Feeds damaged movies to the reader; every movie it accepts must be possible to copy and to finish.
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string>

#include "capture/movie/file_io.h"
#include "capture/movie/fragment_boxes.h"
#include "capture/movie/movie_boxes.h"
#include "capture/movie/movie_copy.h"
#include "capture/movie/movie_finish.h"
#include "capture/movie/movie_reader.h"
#include "capture/movie/sample_description.h"
#include "support/unique_fd.h"

namespace {

using lmx::Bytes;

void require(bool holds) {
  if (!holds) std::abort();
}

/// A file in memory.
class MemoryFile {
 public:
  explicit MemoryFile(std::span<const std::uint8_t> bytes) : fd_(memfd_create("movie", MFD_CLOEXEC)) {
    require(lmx::writeAllAt(fd_.get(), bytes, 0) == 0);
  }
  [[nodiscard]] std::string path() const { return "/proc/self/fd/" + std::to_string(fd_.get()); }

 private:
  lmx::UniqueFd fd_;
};

void append(Bytes& to, std::span<const std::uint8_t> bytes) {
  to.insert(to.end(), bytes.begin(), bytes.end());
}

/// Picture and sound, without fragments.
Bytes beginning() {
  const Bytes config{1, 100, 0, 40, 0xFF, 0xE1, 0, 0};
  const Bytes sound{0x11, 0x90};
  Bytes movie = lmx::fileStart();
  append(movie, lmx::fragmentedHeader({{.isVideo = true,
                                        .timescale = 30000,
                                        .width = 64,
                                        .height = 36,
                                        .sampleDescription = lmx::videoSampleDescription(64, 36, config)},
                                       {.timescale = 48000,
                                        .sampleDescription = lmx::audioSampleDescription(48000, 2, sound)}}));
  return movie;
}

Bytes fragment(std::uint32_t number) {
  const std::uint64_t n = number;
  Bytes bytes = lmx::fragmentHeader(number + 1, {{1, n * 2000, {{10, 1000, true}, {20, 1000, false}}},
                                                 {2, n * 2048, {{5, 1024}, {5, 1024}}}});
  bytes.resize(bytes.size() + 40);
  return bytes;
}

/// Everything that recovery does with a movie it has read.
void use(const Bytes& bytes) {
  const MemoryFile file(bytes);
  const auto index = lmx::readMovieIndex(file.path());
  if (!index) return;
  require(index->mediaEnd <= bytes.size());
  std::size_t longest = 0;
  for (const lmx::TrackIndex& track : index->tracks) {
    std::size_t sample = 0;
    for (const lmx::Chunk& chunk : track.chunks) {
      std::uint64_t end = chunk.offset;
      for (std::uint32_t i = 0; i < chunk.samples; ++i) end += track.sizes[sample++];
      require(end <= index->mediaEnd);
    }
    require(sample == track.sizes.size());
    longest = std::max(longest, sample);
  }
  const MemoryFile copy({});
  const auto frames = static_cast<std::uint32_t>(longest);
  const int copied =
      lmx::copyMovieRanges(file.path(), *index, {{0, 1}, {1, frames}}, 1.0 / 30.0, copy.path());
  require(copied == 0 || copied == ENODATA);
  require(lmx::finishMovieInPlace(file.path(), *index) == 0);
  const auto again = lmx::readMovieIndex(file.path());
  require(again && again->mediaEnd == index->mediaEnd);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span<const std::uint8_t> input(data, size);
  use(Bytes(input.begin(), input.end()));
  // Behind a sound beginning, as fragments.
  Bytes begun = beginning();
  append(begun, input);
  use(begun);
  // As places and values of bytes in a sound movie.
  Bytes movie = beginning();
  for (std::uint32_t i = 0; i < 3; ++i) append(movie, fragment(i));
  for (std::size_t i = 0; i + 2 < size; i += 3) {
    const std::size_t at = static_cast<std::size_t>(data[i]) << 8 | data[i + 1];
    movie[at % movie.size()] = data[i + 2];
  }
  use(movie);
  return 0;
}

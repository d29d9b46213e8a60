// What a movie holds: its tracks, and the size, place and time of every sample. Pure.
#pragma once
#include <cstdint>
#include <vector>

namespace lmx {

using Bytes = std::vector<std::uint8_t>;

/// What is fixed about a track before its first sample.
struct TrackFormat {
  bool isVideo = false;
  std::uint32_t timescale = 0;  ///< units a second
  std::uint16_t width = 0;      ///< pixels, video
  std::uint16_t height = 0;
  Bytes sampleDescription;  ///< the whole "stsd" box
  /// Timescale units at the start of the media that are decoded but not presented: an encoder's delay, or
  /// what a decoder needs before it is right.
  std::uint32_t priming = 0;
};

/// One contiguous run of samples in the file.
struct Chunk {
  std::uint64_t offset = 0;  ///< bytes from the start of the file
  std::uint32_t samples = 0;
};

/// `count` samples of `duration` each.
struct DurationRun {
  std::uint32_t count = 0;
  std::uint32_t duration = 0;
};

/// The samples of one track, in decoding order (which is also presentation order: nothing here reorders).
struct TrackIndex {
  TrackFormat format;
  std::vector<std::uint32_t> sizes;        ///< bytes, one a sample
  std::vector<std::uint32_t> syncSamples;  ///< zero-based numbers of key frames; video only
  std::vector<Chunk> chunks;
  std::vector<DurationRun> durations;
  std::uint64_t totalDuration = 0;  ///< timescale units

  /// Appends a sample to the newest chunk; there must be one.
  void addSample(std::uint32_t size, std::uint32_t duration, bool sync);
  /// What is presented of it, timescale units.
  [[nodiscard]] std::uint64_t presented() const {
    return totalDuration > format.priming ? totalDuration - format.priming : 0;
  }
  [[nodiscard]] double seconds() const {
    return format.timescale == 0 ? 0 : static_cast<double>(presented()) / format.timescale;
  }
};

/// Built while a movie is written, or by reading one back.
struct MovieIndex {
  std::vector<TrackIndex> tracks;
  std::uint64_t mediaEnd = 0;  ///< file offset behind the last whole fragment
  std::uint64_t created = 0;   ///< see movieTimeNow

  /// The first track of its kind; null when there is none.
  [[nodiscard]] const TrackIndex* video() const;
  [[nodiscard]] const TrackIndex* audio() const;
  /// Length of the longest track, seconds.
  [[nodiscard]] double seconds() const;
};

}  // namespace lmx

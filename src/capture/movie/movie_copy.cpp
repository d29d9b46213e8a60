// Finds the samples of each range and copies them.
#include "capture/movie/movie_copy.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>

#include "capture/movie/file_io.h"
#include "capture/movie/movie_boxes.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

/// Chunks of a second or so are small enough for players.
constexpr std::size_t kSamplesPerChunk = 48;

/// A half-open range of a track's samples.
struct SampleRange {
  std::size_t first = 0;
  std::size_t end = 0;
};

/// A track to copy from: its index, and where each of its samples lies and how long it is.
struct SourceTrack {
  explicit SourceTrack(const TrackIndex& track);
  /// Seconds from the start of the movie to the sample.
  [[nodiscard]] double secondsBefore(std::size_t sample) const;
  /// Length of a sample of a track whose samples are all equally long.
  [[nodiscard]] double sampleSeconds() const;
  /// A picture can only be decoded from a key frame on.
  [[nodiscard]] std::size_t keyFrameAtOrBefore(std::size_t sample) const;

  const TrackIndex& index;
  std::vector<std::uint64_t> offsets;
  std::vector<std::uint32_t> durations;
};

SourceTrack::SourceTrack(const TrackIndex& track) : index(track) {
  offsets.reserve(track.sizes.size());
  durations.reserve(track.sizes.size());
  for (const Chunk& chunk : track.chunks) {
    std::uint64_t offset = chunk.offset;
    for (std::uint32_t i = 0; i < chunk.samples; ++i) {
      const std::uint32_t size = track.sizes[offsets.size()];
      offsets.push_back(offset);
      offset += size;
    }
  }
  for (const DurationRun& run : track.durations) durations.insert(durations.end(), run.count, run.duration);
}

double SourceTrack::secondsBefore(std::size_t sample) const {
  std::uint64_t units = 0;
  for (std::size_t i = 0; i < sample && i < durations.size(); ++i) units += durations[i];
  return static_cast<double>(units) / index.format.timescale;
}

double SourceTrack::sampleSeconds() const {
  const std::uint32_t units = durations.empty() ? 0 : durations.front();
  return units == 0 ? 1.0 : static_cast<double>(units) / index.format.timescale;
}

std::size_t SourceTrack::keyFrameAtOrBefore(std::size_t sample) const {
  if (!index.format.isVideo) return sample;
  const auto after = std::upper_bound(index.syncSamples.begin(), index.syncSamples.end(), sample);
  return after == index.syncSamples.begin() ? sample : *std::prev(after);
}

/// Appends ranges to the new file and to its index. The first track leads: ranges are counted in its time.
class RangeCopier {
 public:
  /// @param out  index of the new file, with the tracks of `index`
  RangeCopier(int source, int target, const MovieIndex& index, MovieIndex& out);
  /// All return 0 or the errno.
  int copy(const FrameRange& frames, double frameSeconds);

 private:
  [[nodiscard]] SampleRange leadSamples(const FrameRange& frames, double frameSeconds) const;
  [[nodiscard]] SampleRange samplesFrom(std::size_t track, double seconds) const;
  int copySamples(std::size_t track, SampleRange range);
  int copyBytes(std::uint64_t from, std::uint64_t count);

  int source_;
  int target_;
  MovieIndex& out_;
  std::vector<SourceTrack> tracks_;
  std::vector<double> copied_;  ///< seconds of each track
};

RangeCopier::RangeCopier(int source, int target, const MovieIndex& index, MovieIndex& out)
    : source_(source),
      target_(target),
      out_(out),
      tracks_(index.tracks.begin(), index.tracks.end()),
      copied_(index.tracks.size()) {}

int RangeCopier::copy(const FrameRange& frames, double frameSeconds) {
  const SampleRange range = leadSamples(frames, frameSeconds);
  if (const int error = copySamples(0, range)) return error;
  const double from = tracks_[0].secondsBefore(range.first);
  copied_[0] += tracks_[0].secondsBefore(range.end) - from;
  for (std::size_t t = 1; t < tracks_.size(); ++t) {
    const SampleRange samples = samplesFrom(t, from);
    if (samples.first >= samples.end) continue;
    if (const int error = copySamples(t, samples)) return error;
    copied_[t] += static_cast<double>(samples.end - samples.first) * tracks_[t].sampleSeconds();
  }
  return 0;
}

/// The samples of the leading track for a range of frames. A frame is one sample of the picture, or a stretch
/// of the sound where there is no picture.
SampleRange RangeCopier::leadSamples(const FrameRange& frames, double frameSeconds) const {
  const SourceTrack& lead = tracks_[0];
  const std::uint32_t sampleUnits = std::max(1U, lead.durations.front());
  const double perFrame = frameSeconds * lead.index.format.timescale / sampleUnits;
  const auto sampleOf = [&](std::uint32_t frame) {
    const double sample = std::min(frame * perFrame, static_cast<double>(lead.offsets.size()));
    return static_cast<std::size_t>(std::lround(sample));
  };
  return {lead.keyFrameAtOrBefore(sampleOf(frames.first)), sampleOf(frames.end)};
}

/// As many samples of `track`, from `seconds` on, as it takes to be as long as the leading track. This evens
/// out the rounding of earlier ranges: sound never drifts away from the picture.
SampleRange RangeCopier::samplesFrom(std::size_t track, double seconds) const {
  const double sample = tracks_[track].sampleSeconds();
  const auto first = static_cast<std::size_t>(std::lround(seconds / sample));
  const auto count =
      static_cast<std::size_t>(std::max(0L, std::lround((copied_[0] - copied_[track]) / sample)));
  return {first, std::min(first + count, tracks_[track].offsets.size())};
}

int RangeCopier::copySamples(std::size_t track, SampleRange range) {
  const SourceTrack& from = tracks_[track];
  TrackIndex& to = out_.tracks[track];
  for (std::size_t i = range.first; i < range.end;) {
    const std::size_t start = i;
    std::uint64_t bytes = 0;
    to.chunks.push_back({out_.mediaEnd, 0});
    while (i < range.end && i - start < kSamplesPerChunk && from.offsets[i] == from.offsets[start] + bytes) {
      const auto& keys = from.index.syncSamples;
      to.addSample(from.index.sizes[i], from.durations[i], std::binary_search(keys.begin(), keys.end(), i));
      bytes += from.index.sizes[i++];
    }
    if (const int error = copyBytes(from.offsets[start], bytes)) return error;
  }
  return 0;
}

int RangeCopier::copyBytes(std::uint64_t from, std::uint64_t count) {
  Bytes buffer(count);
  if (const int error = readAllAt(source_, buffer, from)) return error;
  if (const int error = writeAllAt(target_, buffer, out_.mediaEnd)) return error;
  out_.mediaEnd += count;
  return 0;
}

/// Everything but the media. @return 0 or the errno
int writeBoxes(int fd, const MovieIndex& index) {
  if (const int error = writeAllAt(fd, fileStart(), 0)) return error;
  if (const int error = writeAllAt(fd, mediaHead(index.mediaEnd), kFileTypeSize)) return error;
  return writeAllAt(fd, movieHeader(index), index.mediaEnd);
}

}  // namespace

int copyMovieRanges(const std::string& source, const MovieIndex& index, const std::vector<FrameRange>& ranges,
                    double frameSeconds, const std::string& target) {
  const UniqueFd from(open(source.c_str(), O_RDONLY | O_CLOEXEC));
  if (!from.valid()) return errno;
  const UniqueFd to(open(target.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0644));
  if (!to.valid()) return errno;
  if (index.tracks.empty() || index.tracks.front().sizes.empty()) return ENODATA;
  MovieIndex out;
  for (const TrackIndex& track : index.tracks) out.tracks.push_back({.format = track.format});
  out.mediaEnd = kFileTypeSize + kPlaceholderSize;
  RangeCopier copier(from.get(), to.get(), index, out);
  for (const FrameRange& range : ranges) {
    if (const int error = copier.copy(range, frameSeconds)) return error;
  }
  if (const int error = writeBoxes(to.get(), out)) return error;
  return fdatasync(to.get()) == 0 ? 0 : errno;
}

}  // namespace lmx

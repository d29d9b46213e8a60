// Copying ranges of a movie into a new one without encoding.
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>

#include "capture/movie/movie_boxes.h"
#include "capture/movie/movie_file.h"

namespace lmx {
namespace {

/// Where each sample of a track lies and how long it is.
struct SamplePlaces {
  std::vector<std::uint64_t> offsets;
  std::vector<std::uint32_t> durations;
};

SamplePlaces placesOf(const TrackIndex& track) {
  SamplePlaces places;
  places.offsets.reserve(track.sizes.size());
  places.durations.reserve(track.sizes.size());
  std::size_t sample = 0;
  for (const Chunk& chunk : track.chunks) {
    std::uint64_t offset = chunk.offset;
    for (std::uint32_t i = 0; i < chunk.samples; ++i, ++sample) {
      places.offsets.push_back(offset);
      offset += track.sizes[sample];
    }
  }
  for (const DurationRun& run : track.durations)
    places.durations.insert(places.durations.end(), run.count, run.duration);
  return places;
}

/// Appends runs of samples to the target file and to its index.
class RangeCopier {
 public:
  RangeCopier(int source, int target, MovieIndex& out) : source_(source), target_(target), out_(out) {}

  int copy(const TrackIndex& track, const SamplePlaces& places, std::size_t trackNumber, std::size_t first,
           std::size_t end) {
    TrackIndex& to = out_.tracks[trackNumber];
    for (std::size_t i = first; i < end;) {
      // As many samples as lie side by side, but no more than a second or so: chunks stay small for players.
      const std::size_t start = i;
      std::uint64_t bytes = 0;
      while (i < end && i - start < 48 && places.offsets[i] == places.offsets[start] + bytes)
        bytes += track.sizes[i++];
      to.chunks.push_back({out_.mediaEnd, 0});
      for (std::size_t s = start; s < i; ++s) {
        const bool sync = std::binary_search(track.syncSamples.begin(), track.syncSamples.end(), s);
        to.addSample(track.sizes[s], places.durations[s], sync);
      }
      if (const int error = copyBytes(places.offsets[start], bytes)) return error;
    }
    return 0;
  }

 private:
  int copyBytes(std::uint64_t from, std::uint64_t count) {
    Bytes buffer(count);
    std::uint64_t done = 0;
    while (done < count) {
      const ssize_t n = pread(source_, buffer.data() + done, count - done, static_cast<off_t>(from + done));
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) return n < 0 ? errno : EIO;
      done += static_cast<std::uint64_t>(n);
    }
    for (done = 0; done < count;) {
      const ssize_t n =
          pwrite(target_, buffer.data() + done, count - done, static_cast<off_t>(out_.mediaEnd + done));
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) return n < 0 ? errno : EIO;
      done += static_cast<std::uint64_t>(n);
    }
    out_.mediaEnd += count;
    return 0;
  }

  int source_;
  int target_;
  MovieIndex& out_;
};

std::uint32_t keyFrameAtOrBefore(const TrackIndex& track, std::uint32_t sample) {
  if (!track.format.isVideo) return sample;
  const auto after = std::upper_bound(track.syncSamples.begin(), track.syncSamples.end(), sample);
  return after == track.syncSamples.begin() ? sample : *std::prev(after);
}

double secondsBefore(const SamplePlaces& places, std::size_t sample, std::uint32_t timescale) {
  std::uint64_t units = 0;
  for (std::size_t i = 0; i < sample && i < places.durations.size(); ++i) units += places.durations[i];
  return static_cast<double>(units) / timescale;
}

int copyRanges(int source, int target, const MovieIndex& index, const std::vector<FrameRange>& ranges,
               double frameSeconds, MovieIndex& out) {
  const TrackIndex& lead = index.tracks.front();
  std::vector<SamplePlaces> places;
  for (const TrackIndex& track : index.tracks) places.push_back(placesOf(track));
  RangeCopier copier(source, target, out);
  double leadSeconds = 0;
  std::vector<double> copied(index.tracks.size(), 0.0);
  if (places[0].durations.empty()) return ENODATA;
  // A frame of the ranges is a sample of the picture; where there is only sound it is a stretch of it.
  const double perSample = frameSeconds * lead.format.timescale / places[0].durations.front();
  for (const FrameRange& frames : ranges) {
    FrameRange range{static_cast<std::uint32_t>(std::lround(frames.first * perSample)),
                     static_cast<std::uint32_t>(std::lround(frames.end * perSample))};
    range.first = keyFrameAtOrBefore(lead, range.first);
    range.end = std::min(range.end, static_cast<std::uint32_t>(lead.sizes.size()));
    const double from = secondsBefore(places[0], range.first, lead.format.timescale);
    const double to = secondsBefore(places[0], range.end, lead.format.timescale);
    if (const int error = copier.copy(lead, places[0], 0, range.first, range.end)) return error;
    leadSeconds += to - from;
    for (std::size_t t = 1; t < index.tracks.size(); ++t) {
      const TrackIndex& track = index.tracks[t];
      const double frame =
          places[t].durations.empty() ? 1.0 : places[t].durations.front() / double(track.format.timescale);
      const auto first = static_cast<std::size_t>(std::lround(from / frame));
      // What earlier ranges were rounded by is made good here, so that sound never runs away from the
      // picture.
      const auto count =
          static_cast<std::size_t>(std::max(0L, std::lround((leadSeconds - copied[t]) / frame)));
      const std::size_t end = std::min(first + count, track.sizes.size());
      if (first >= end) continue;
      if (const int error = copier.copy(track, places[t], t, first, end)) return error;
      copied[t] += static_cast<double>(end - first) * frame;
    }
  }
  return 0;
}

}  // namespace

int copyMovieRanges(const std::string& source, const MovieIndex& index, const std::vector<FrameRange>& ranges,
                    double frameSeconds, const std::string& target) {
  const UniqueFd from(open(source.c_str(), O_RDONLY | O_CLOEXEC));
  if (!from.valid()) return errno;
  const UniqueFd to(open(target.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0644));
  if (!to.valid()) return errno;
  MovieIndex out;
  for (const TrackIndex& track : index.tracks) out.tracks.push_back({.format = track.format});
  out.mediaEnd = kFileTypeSize + kPlaceholderSize;
  if (const int error = copyRanges(from.get(), to.get(), index, ranges, frameSeconds, out)) return error;
  const Bytes start = fileStart();
  const Bytes head = mediaHead(out.mediaEnd);
  const Bytes header = movieHeader(out);
  const auto put = [&](const Bytes& bytes, std::uint64_t at) {
    return pwrite(to.get(), bytes.data(), bytes.size(), static_cast<off_t>(at)) ==
           static_cast<ssize_t>(bytes.size());
  };
  errno = EIO;
  if (!put(start, 0) || !put(head, kFileTypeSize) || !put(header, out.mediaEnd)) return errno;
  return fdatasync(to.get()) == 0 ? 0 : errno;
}

}  // namespace lmx

// Finds the samples of each range and copies them.
#include "capture/movie/movie_copy.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <iterator>

#include "capture/movie/file_io.h"
#include "capture/movie/movie_boxes.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

/// Chunks of a second or so are small enough for players.
constexpr std::size_t kSamplesPerChunk = 48;

/// What is copied of a track: samples, and the time they cover, which may begin or end inside a sample.
struct Piece {
  std::size_t first = 0;
  std::size_t end = 0;
  std::size_t shown = 0;    ///< the samples before it are there to be decoded only
  std::uint64_t start = 0;  ///< timescale units
  std::uint64_t stop = 0;
  [[nodiscard]] bool empty() const { return first >= end || start >= stop; }
};

/// A part of the movie's time, seconds.
struct Stretch {
  double start = 0;
  double end = 0;
};

/// A track to copy from: its index, and where each of its samples lies and when it begins.
struct SourceTrack {
  explicit SourceTrack(const TrackIndex& track);
  [[nodiscard]] std::size_t size() const { return offsets.size(); }
  [[nodiscard]] std::uint64_t total() const { return starts.back(); }
  [[nodiscard]] double seconds(std::uint64_t units) const {
    return static_cast<double>(units) / index.format.timescale;
  }
  /// Timescale units up to a frame of the movie's clock; the end of the track if that is earlier.
  [[nodiscard]] std::uint64_t unitsTo(std::uint32_t frame, double frameSeconds) const;
  /// The sample that is shown at `units`.
  [[nodiscard]] std::size_t sampleAt(std::uint64_t units) const;
  /// The sample whose start is nearest to `units`; may be the one behind the last.
  [[nodiscard]] std::size_t sampleNear(std::uint64_t units) const;
  [[nodiscard]] bool isKey(std::size_t sample) const;
  /// The nearest position inside the track.
  [[nodiscard]] std::uint64_t clamped(std::int64_t units) const;

  const TrackIndex& index;
  std::vector<std::uint64_t> offsets;
  std::vector<std::uint64_t> starts;  ///< and the end of the last sample: one more than there are samples
};

SourceTrack::SourceTrack(const TrackIndex& track) : index(track), starts{0} {
  offsets.reserve(track.sizes.size());
  starts.reserve(track.sizes.size() + 1);
  for (const Chunk& chunk : track.chunks) {
    std::uint64_t offset = chunk.offset;
    for (std::uint32_t i = 0; i < chunk.samples; ++i) {
      const std::uint32_t size = track.sizes[offsets.size()];
      offsets.push_back(offset);
      offset += size;
    }
  }
  for (const DurationRun& run : track.durations) {
    for (std::uint32_t i = 0; i < run.count; ++i) starts.push_back(starts.back() + run.duration);
  }
}

std::uint64_t SourceTrack::unitsTo(std::uint32_t frame, double frameSeconds) const {
  const double units = std::round(frame * frameSeconds * index.format.timescale);
  return std::min(total(), static_cast<std::uint64_t>(units));
}

std::size_t SourceTrack::sampleAt(std::uint64_t units) const {
  const auto after = std::upper_bound(starts.begin(), std::prev(starts.end()), units);
  return static_cast<std::size_t>(std::max<std::ptrdiff_t>(0, after - starts.begin() - 1));
}

std::size_t SourceTrack::sampleNear(std::uint64_t units) const {
  const auto after = std::lower_bound(starts.begin(), starts.end(), units);
  if (after == starts.end()) return size();
  const auto sample = static_cast<std::size_t>(after - starts.begin());
  return sample > 0 && units - starts[sample - 1] < starts[sample] - units ? sample - 1 : sample;
}

bool SourceTrack::isKey(std::size_t sample) const {
  return !index.format.isVideo ||
         std::binary_search(index.syncSamples.begin(), index.syncSamples.end(), sample);
}

std::uint64_t SourceTrack::clamped(std::int64_t units) const {
  return static_cast<std::uint64_t>(std::clamp<std::int64_t>(units, 0, static_cast<std::int64_t>(total())));
}

/// The frames that are shown from `start` to `stop`. A picture can only be decoded from a key frame on: those
/// between it and the first one that is shown come along, too short to be seen. Nothing from before `start`
/// is shown or heard.
Piece framesBetween(const SourceTrack& track, std::uint64_t start, std::uint64_t stop) {
  Piece piece{.start = start, .stop = stop};
  const auto end = std::lower_bound(track.starts.begin(), std::prev(track.starts.end()), stop);
  piece.end = static_cast<std::size_t>(end - track.starts.begin());
  piece.first = track.sampleAt(start);
  if (piece.empty() || track.isKey(piece.first)) return piece;
  // A mark in a hole has made the frame behind the hole a key frame: it stands for the rest of the hole.
  const std::size_t next = piece.first + 1;
  if (track.starts[piece.first] < start && next < piece.end && track.isKey(next)) {
    piece.first = next;
    return piece;
  }
  piece.shown = piece.first;
  while (piece.first > 0 && !track.isKey(piece.first)) --piece.first;
  return piece;
}

/// Appends ranges to the new file and to its index. The first track leads: ranges are counted in its time.
class RangeCopier {
 public:
  /// @param out  index of the new file, with the tracks of `index`
  RangeCopier(int source, int target, const MovieIndex& index, MovieIndex& out);
  /// All return 0 or the errno.
  int copy(const FrameRange& frames, double frameSeconds);

 private:
  [[nodiscard]] Piece soundFor(std::size_t track, const Stretch& stretch);
  int copySamples(std::size_t track, const Piece& piece);
  int copyBytes(std::uint64_t from, std::uint64_t count);

  int source_;
  int target_;
  MovieIndex& out_;
  std::vector<SourceTrack> tracks_;
  double copied_seconds_ = 0;
};

RangeCopier::RangeCopier(int source, int target, const MovieIndex& index, MovieIndex& out)
    : source_(source), target_(target), out_(out), tracks_(index.tracks.begin(), index.tracks.end()) {}

int RangeCopier::copy(const FrameRange& frames, double frameSeconds) {
  Stretch stretch{frames.first * frameSeconds, frames.end * frameSeconds};
  const SourceTrack& lead = tracks_[0];
  const bool hasPicture = lead.index.format.isVideo;
  if (hasPicture) {
    const Piece piece =
        framesBetween(lead, lead.unitsTo(frames.first, frameSeconds), lead.unitsTo(frames.end, frameSeconds));
    if (piece.empty()) return 0;
    if (const int error = copySamples(0, piece)) return error;
    stretch = {lead.seconds(piece.start), lead.seconds(piece.stop)};
  }
  for (std::size_t t = hasPicture ? 1 : 0; t < tracks_.size(); ++t) {
    const Piece sound = soundFor(t, stretch);
    if (sound.empty()) continue;
    if (const int error = copySamples(t, sound)) return error;
  }
  copied_seconds_ += stretch.end - stretch.start;
  return 0;
}

/// The packets of a stretch of the source, and the one before the first, which makes the decoder right. Later
/// stretches follow in whole packets: each begins and ends with the packet that comes nearest, so sound is
/// never further than half a packet from its picture.
Piece RangeCopier::soundFor(std::size_t track, const Stretch& stretch) {
  const SourceTrack& from = tracks_[track];
  TrackIndex& to = out_.tracks[track];
  const auto units = [&](double seconds) { return std::llround(seconds * from.index.format.timescale); };
  const std::int64_t presented = static_cast<std::int64_t>(to.totalDuration) - to.format.priming;
  const std::int64_t ahead = to.sizes.empty() ? 0 : presented - units(copied_seconds_);
  const auto begin = from.clamped(units(stretch.start) + from.index.format.priming + ahead);
  Piece piece;
  if (to.sizes.empty()) {
    piece.first = from.sampleAt(begin);
    if (piece.first > 0) --piece.first;
    to.format.priming = static_cast<std::uint32_t>(begin - from.starts[piece.first]);
  } else {
    piece.first = from.sampleNear(begin);
  }
  const std::int64_t length = units(stretch.end) - units(stretch.start) - ahead;
  piece.end = from.sampleNear(from.clamped(static_cast<std::int64_t>(begin) + length));
  piece.start = from.starts[piece.first];
  piece.stop = from.starts[std::max(piece.first, piece.end)];
  return piece;
}

int RangeCopier::copySamples(std::size_t track, const Piece& piece) {
  const SourceTrack& from = tracks_[track];
  TrackIndex& to = out_.tracks[track];
  std::uint64_t at = piece.start;
  for (std::size_t i = piece.first; i < piece.end;) {
    const std::size_t start = i;
    std::uint64_t bytes = 0;
    to.chunks.push_back({out_.mediaEnd, 0});
    while (i < piece.end && i - start < kSamplesPerChunk && from.offsets[i] == from.offsets[start] + bytes) {
      const std::uint64_t until = i < piece.shown ? at + 1 : std::min(from.starts[i + 1], piece.stop);
      to.addSample(from.index.sizes[i], static_cast<std::uint32_t>(until - at), from.isKey(i));
      bytes += from.index.sizes[i++];
      at = until;
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
  return writeAllAt(fd, movieHeader(index, movieTimeNow()), index.mediaEnd);
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
  out.created = index.created;
  out.mediaEnd = kFileTypeSize + kPlaceholderSize;
  RangeCopier copier(from.get(), to.get(), index, out);
  for (const FrameRange& range : ranges) {
    if (const int error = copier.copy(range, frameSeconds)) return error;
  }
  if (const int error = writeBoxes(to.get(), out)) return error;
  return fdatasync(to.get()) == 0 ? 0 : errno;
}

}  // namespace lmx

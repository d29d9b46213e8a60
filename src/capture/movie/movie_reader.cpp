// Builds an index from the boxes of a growing movie.
#include "capture/movie/movie_reader.h"

#include <fcntl.h>

#include <algorithm>

#include "capture/movie/box_file.h"
#include "capture/movie/box_reader.h"
#include "capture/movie/fragment_boxes.h"
#include "capture/movie/movie_boxes.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

using Body = std::span<const std::uint8_t>;

void readTrackHeader(Body body, TrackFormat& format) {
  if (body.size() < 96) return;
  BoxReader reader(body);
  reader.take(88);
  format.width = static_cast<std::uint16_t>(reader.u32() >> 16);
  format.height = static_cast<std::uint16_t>(reader.u32() >> 16);
}

/// The priming. Movies of earlier versions have no edits; one that makes no sense counts as none.
void readEditList(Body body, TrackFormat& format) {
  constexpr std::uint64_t kLongestPriming = 1U << 20;
  BoxReader reader(body);
  const bool wide = reader.u32() >> 24 == 1;
  reader.u32();  // how many
  wide ? reader.u64() : reader.u32();
  const std::uint64_t start = wide ? reader.u64() : reader.u32();
  if (reader.ok() && start <= kLongestPriming) format.priming = static_cast<std::uint32_t>(start);
}

void readTrackBoxes(Body bytes, TrackFormat& format) {
  forEachBox(bytes, [&](std::string_view type, Body body, Body whole) {
    if (type == "tkhd") {
      readTrackHeader(body, format);
    } else if (type == "mdhd") {
      BoxReader reader(body);
      reader.take(20);
      format.timescale = reader.u32();
    } else if (type == "vmhd") {
      format.isVideo = true;
    } else if (type == "stsd") {
      format.sampleDescription.assign(whole.begin(), whole.end());
    } else if (type == "elst") {
      readEditList(body, format);
    } else if (type == "edts" || type == "mdia" || type == "minf" || type == "stbl") {
      readTrackBoxes(body, format);
    }
  });
}

/// The tracks of a movie, without samples; none at all if one of them makes no sense.
MovieIndex readTracks(Body moov) {
  MovieIndex index;
  forEachBox(moov, [&](std::string_view type, Body body, Body) {
    if (type == "trak") readTrackBoxes(body, index.tracks.emplace_back().format);
    if (type == "mvhd") {
      BoxReader reader(body);
      reader.u32();
      index.created = reader.u64();
    }
  });
  for (const TrackIndex& track : index.tracks) {
    if (track.format.timescale == 0 || track.format.sampleDescription.empty()) return {};
  }
  return index;
}

/// Reads one "trun" into the track. @param moofStart  file offset that its data offset counts from
/// @return whether all of it could be read
bool readTrackRun(BoxReader reader, std::uint64_t moofStart, TrackIndex& track) {
  const std::uint32_t count = reader.u32();
  track.chunks.push_back({moofStart + reader.u32(), 0});
  for (std::uint32_t i = 0; i < count && reader.ok(); ++i) {
    const std::uint32_t duration = reader.u32();
    const std::uint32_t size = reader.u32();
    const std::uint32_t flags = reader.u32();
    if (reader.ok()) track.addSample(size, duration, (flags & kSampleIsNotSync) == 0);
  }
  return reader.ok();
}

/// Reads one "traf" into its track. @return whether all of it could be read
bool readTrackFragment(Body traf, std::uint64_t moofStart, MovieIndex& fragment) {
  std::uint32_t number = 0;
  bool good = true;
  forEachBox(traf, [&](std::string_view type, Body body, Body) {
    BoxReader reader(body);
    reader.u32();
    if (type == "tfhd") number = reader.u32();
    if (type != "trun") return;
    good = good && number > 0 && number <= fragment.tracks.size() &&
           readTrackRun(reader, moofStart, fragment.tracks[number - 1]);
  });
  return good;
}

/// Appends the samples of a fragment.
void join(TrackIndex& track, const TrackIndex& part) {
  std::size_t sample = 0;
  std::size_t sync = 0;
  std::size_t run = 0;
  std::uint32_t inRun = 0;
  for (const Chunk& chunk : part.chunks) {
    track.chunks.push_back({chunk.offset, 0});
    for (std::uint32_t i = 0; i < chunk.samples; ++i, ++sample) {
      const bool isSync = sync < part.syncSamples.size() && part.syncSamples[sync] == sample;
      if (isSync) ++sync;
      track.addSample(part.sizes[sample], part.durations[run].duration, isSync);
      if (++inRun == part.durations[run].count) {
        inRun = 0;
        ++run;
      }
    }
  }
}

/// Whether all samples of `track` lie inside their "mdat". In a damaged head they may point anywhere.
bool liesWithin(const TrackIndex& track, const BoxFile::Box& mdat) {
  std::size_t sample = 0;
  for (const Chunk& chunk : track.chunks) {
    std::uint64_t end = chunk.offset;
    for (std::uint32_t i = 0; i < chunk.samples; ++i) end += track.sizes[sample++];
    if (chunk.offset < mdat.bodyStart() || end > mdat.end()) return false;
  }
  return true;
}

/// Adds the fragment that starts at the end of the index's media. @return false, with the index unchanged,
/// when there is no whole fragment
bool readFragment(const BoxFile& file, MovieIndex& index) {
  const auto moof = file.boxAt(index.mediaEnd, "moof");
  const auto mdat = moof ? file.boxAt(moof->end(), "mdat") : std::nullopt;
  if (!mdat) return false;
  MovieIndex fragment;
  for (const TrackIndex& track : index.tracks) fragment.tracks.push_back({.format = track.format});
  bool good = true;
  forEachBox(file.body(*moof), [&](std::string_view type, Body body, Body) {
    if (type == "traf") good = good && readTrackFragment(body, moof->start, fragment);
  });
  good = good && std::all_of(fragment.tracks.begin(), fragment.tracks.end(),
                             [&](const TrackIndex& track) { return liesWithin(track, *mdat); });
  if (!good) return false;
  for (std::size_t i = 0; i < index.tracks.size(); ++i) join(index.tracks[i], fragment.tracks[i]);
  index.mediaEnd = mdat->end();
  return true;
}

}  // namespace

std::optional<MovieIndex> readMovieIndex(const std::string& path) {
  const UniqueFd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!fd.valid()) return std::nullopt;
  const BoxFile file(fd.get());
  const auto moov = file.boxAt(kFileTypeSize + kPlaceholderSize, "moov");
  if (!moov) return std::nullopt;
  MovieIndex index = readTracks(file.body(*moov));
  if (index.tracks.empty()) return std::nullopt;
  index.mediaEnd = moov->end();
  while (readFragment(file, index)) {
  }
  return index;
}

}  // namespace lmx

// Writes a movie fragment by fragment.
#include "capture/movie/growing_movie.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "capture/movie/file_io.h"
#include "capture/movie/fragment_boxes.h"
#include "capture/movie/movie_boxes.h"
#include "capture/movie/movie_finish.h"

namespace lmx {
namespace {

/// The samples of track `t`. Their data are appended to `media`.
TrackFragment collect(std::uint32_t t, const TrackIndex& track, const std::vector<EncodedSample>& samples,
                      Bytes& media) {
  TrackFragment fragment{.trackNumber = t + 1, .baseTime = track.totalDuration, .samples = {}};
  for (const EncodedSample& sample : samples) {
    if (sample.track != t) continue;
    fragment.samples.push_back(
        {static_cast<std::uint32_t>(sample.data.size()), sample.duration, sample.sync});
    media.insert(media.end(), sample.data.begin(), sample.data.end());
  }
  return fragment;
}

/// Adds samples that were written from `offset` on, track after track, to the index.
void note(const std::vector<TrackFragment>& fragments, std::uint64_t offset, MovieIndex& index) {
  for (const TrackFragment& fragment : fragments) {
    TrackIndex& track = index.tracks[fragment.trackNumber - 1];
    track.chunks.push_back({offset, 0});
    for (const FragmentSample& sample : fragment.samples) {
      track.addSample(sample.size, sample.duration, sample.sync);
      offset += sample.size;
    }
  }
}

}  // namespace

int GrowingMovie::create(const std::string& path) {
  file_.reset(open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
  return file_.valid() ? 0 : errno;
}

int GrowingMovie::begin(const std::vector<TrackFormat>& tracks) {
  index_.created = movieTimeNow();
  Bytes start = fileStart();
  const Bytes header = fragmentedHeader(tracks, index_.created);
  start.insert(start.end(), header.begin(), header.end());
  if (const int error = writeAllAt(file_.get(), start, 0)) return error;
  for (const TrackFormat& format : tracks) index_.tracks.push_back({.format = format});
  index_.mediaEnd = start.size();
  return 0;
}

int GrowingMovie::append(const std::vector<EncodedSample>& samples) {
  std::vector<TrackFragment> fragments;
  Bytes media;
  for (std::uint32_t t = 0; t < index_.tracks.size(); ++t) {
    TrackFragment fragment = collect(t, index_.tracks[t], samples, media);
    if (!fragment.samples.empty()) fragments.push_back(std::move(fragment));
  }
  if (fragments.empty()) return 0;
  Bytes out = fragmentHeader(sequence_ + 1, fragments);
  const std::uint64_t headSize = out.size();
  out.insert(out.end(), media.begin(), media.end());
  if (const int error = writeAllAt(file_.get(), out, index_.mediaEnd)) {
    if (ftruncate(file_.get(), static_cast<off_t>(index_.mediaEnd)) != 0) return errno;
    return error;
  }
  ++sequence_;
  note(fragments, index_.mediaEnd + headSize, index_);
  index_.mediaEnd += out.size();
  return 0;
}

int GrowingMovie::sync() const { return fdatasync(file_.get()) == 0 ? 0 : errno; }

int GrowingMovie::finish() {
  const int error = finishMovie(file_.get(), index_);
  file_.reset();
  return error;
}

}  // namespace lmx

// Writing the growing movie and making it whole.
#include "capture/movie/movie_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>

#include "capture/movie/movie_boxes.h"

namespace lmx {
namespace {

int writeAll(int fd, const std::uint8_t* data, std::size_t size, std::uint64_t offset) {
  while (size > 0) {
    const ssize_t n = pwrite(fd, data, size, static_cast<off_t>(offset));
    if (n < 0) {
      if (errno == EINTR) continue;
      return errno;
    }
    data += n;
    offset += static_cast<std::uint64_t>(n);
    size -= static_cast<std::size_t>(n);
  }
  return 0;
}

int writeAll(int fd, const Bytes& bytes, std::uint64_t offset) {
  return writeAll(fd, bytes.data(), bytes.size(), offset);
}

int syncData(int fd) { return fdatasync(fd) == 0 ? 0 : errno; }

/// Appends the index behind the media and, once that is safely on the disk, turns the placeholder into the
/// media's head.
int finishDescriptor(int fd, const MovieIndex& index) {
  const Bytes header = movieHeader(index);
  if (const int error = writeAll(fd, header, index.mediaEnd)) {
    if (ftruncate(fd, static_cast<off_t>(index.mediaEnd)) != 0) return errno;
    return error;
  }
  if (ftruncate(fd, static_cast<off_t>(index.mediaEnd + header.size())) != 0) return errno;
  if (const int error = syncData(fd)) return error;
  if (const int error = writeAll(fd, mediaHead(index.mediaEnd), kFileTypeSize)) return error;
  return syncData(fd);
}

}  // namespace

int GrowingMovie::create(const std::string& path) {
  file_.reset(open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
  return file_.valid() ? 0 : errno;
}

int GrowingMovie::begin(const std::vector<TrackFormat>& tracks) {
  Bytes start = fileStart();
  const Bytes header = fragmentedHeader(tracks);
  start.insert(start.end(), header.begin(), header.end());
  if (const int error = writeAll(file_.get(), start, 0)) return error;
  for (const TrackFormat& format : tracks) index_.tracks.push_back({.format = format});
  index_.mediaEnd = start.size();
  return 0;
}

int GrowingMovie::append(const std::vector<EncodedSample>& samples) {
  std::vector<TrackFragment> fragments;
  Bytes media;
  for (std::uint32_t t = 0; t < index_.tracks.size(); ++t) {
    TrackFragment fragment{t + 1, index_.tracks[t].format.isVideo, index_.tracks[t].totalDuration, {}};
    for (const EncodedSample& sample : samples) {
      if (sample.track != t) continue;
      fragment.samples.push_back(
          {static_cast<std::uint32_t>(sample.data.size()), sample.duration, sample.sync});
      media.insert(media.end(), sample.data.begin(), sample.data.end());
    }
    if (!fragment.samples.empty()) fragments.push_back(std::move(fragment));
  }
  if (fragments.empty()) return 0;
  Bytes out = fragmentHeader(sequence_ + 1, fragments);
  const std::uint64_t headSize = out.size();
  out.insert(out.end(), media.begin(), media.end());
  if (const int error = writeAll(file_.get(), out, index_.mediaEnd)) {
    if (ftruncate(file_.get(), static_cast<off_t>(index_.mediaEnd)) != 0) return errno;
    return error;
  }
  ++sequence_;
  std::uint64_t offset = index_.mediaEnd + headSize;
  for (const TrackFragment& fragment : fragments) {
    TrackIndex& track = index_.tracks[fragment.trackNumber - 1];
    track.chunks.push_back({offset, 0});
    for (const FragmentSample& sample : fragment.samples) {
      track.addSample(sample.size, sample.duration, sample.sync);
      offset += sample.size;
    }
  }
  index_.mediaEnd += out.size();
  return 0;
}

int GrowingMovie::sync() const { return syncData(file_.get()); }

int GrowingMovie::finish() {
  const int error = finishDescriptor(file_.get(), index_);
  file_.reset();
  return error;
}

int finishMovieInPlace(const std::string& path, const MovieIndex& index) {
  const UniqueFd file(open(path.c_str(), O_RDWR | O_CLOEXEC));
  if (!file.valid()) return errno;
  return finishDescriptor(file.get(), index);
}

}  // namespace lmx

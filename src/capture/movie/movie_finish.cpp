// Writes the index behind the media, then the head in front of them.
#include "capture/movie/movie_finish.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "capture/movie/file_io.h"
#include "capture/movie/movie_boxes.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

int syncData(int fd) { return fdatasync(fd) == 0 ? 0 : errno; }

int cutAt(int fd, std::uint64_t size) { return ftruncate(fd, static_cast<off_t>(size)) == 0 ? 0 : errno; }

}  // namespace

int finishMovie(int fd, const MovieIndex& index) {
  const Bytes header = movieHeader(index, movieTimeNow());
  if (const int error = writeAllAt(fd, header, index.mediaEnd)) {
    const int cutError = cutAt(fd, index.mediaEnd);
    return cutError != 0 ? cutError : error;
  }
  if (const int error = cutAt(fd, index.mediaEnd + header.size())) return error;
  if (const int error = syncData(fd)) return error;
  if (const int error = writeAllAt(fd, mediaHead(index.mediaEnd), kFileTypeSize)) return error;
  return syncData(fd);
}

int finishMovieInPlace(const std::string& path, const MovieIndex& index) {
  const UniqueFd file(open(path.c_str(), O_RDWR | O_CLOEXEC));
  return file.valid() ? finishMovie(file.get(), index) : errno;
}

}  // namespace lmx

// Reading back the index of a movie of ours, also of one whose writer died.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string_view>

#include "capture/movie/movie_boxes.h"
#include "capture/movie/movie_file.h"

namespace lmx {
namespace {

constexpr std::uint64_t kHeaderLimit = 16U << 20;  // moov and moof of ours are far smaller

/// Bounds-checked big-endian reading; a read behind the end yields 0 and clears ok().
class Reader {
 public:
  explicit Reader(std::span<const std::uint8_t> bytes) : bytes_(bytes) {}
  [[nodiscard]] bool ok() const { return ok_; }
  [[nodiscard]] std::size_t left() const { return bytes_.size() - at_; }
  [[nodiscard]] std::size_t position() const { return at_; }
  std::uint32_t u32() {
    const auto b = take(4);
    if (b.empty()) return 0;
    return static_cast<std::uint32_t>(b[0]) << 24 | static_cast<std::uint32_t>(b[1]) << 16 |
           static_cast<std::uint32_t>(b[2]) << 8 | b[3];
  }
  std::uint64_t u64() {
    const std::uint64_t high = u32();
    return high << 32 | u32();
  }
  std::span<const std::uint8_t> take(std::size_t n) {
    if (n > left()) {
      ok_ = false;
      at_ = bytes_.size();
      return {};
    }
    const auto part = bytes_.subspan(at_, n);
    at_ += n;
    return part;
  }

 private:
  std::span<const std::uint8_t> bytes_;
  std::size_t at_ = 0;
  bool ok_ = true;
};

/// Calls visit(type, body, wholeBox) for each box in `bytes`; stops at a malformed one.
template <class Visit>
void forEachBox(std::span<const std::uint8_t> bytes, Visit visit) {
  std::size_t at = 0;
  while (bytes.size() - at >= 8) {
    Reader reader(bytes.subspan(at));
    const std::uint32_t size = reader.u32();
    const auto type = reader.take(4);
    if (size < 8 || size > bytes.size() - at) return;
    visit(std::string_view(reinterpret_cast<const char*>(type.data()), 4), bytes.subspan(at + 8, size - 8),
          bytes.subspan(at, size));
    at += size;
  }
}

void readTrackBoxes(std::span<const std::uint8_t> bytes, TrackFormat& format) {
  forEachBox(bytes, [&](std::string_view type, std::span<const std::uint8_t> body, auto whole) {
    Reader reader(body);
    if (type == "tkhd") {
      if (body.size() < 96) return;
      reader.take(88);
      format.width = static_cast<std::uint16_t>(reader.u32() >> 16);
      format.height = static_cast<std::uint16_t>(reader.u32() >> 16);
    } else if (type == "mdhd") {
      reader.take(20);
      format.timescale = reader.u32();
    } else if (type == "vmhd") {
      format.isVideo = true;
    } else if (type == "stsd") {
      format.sampleDescription.assign(whole.begin(), whole.end());
    } else if (type == "mdia" || type == "minf" || type == "stbl") {
      readTrackBoxes(body, format);
    }
  });
}

std::vector<TrackFormat> readTracks(std::span<const std::uint8_t> moov) {
  std::vector<TrackFormat> tracks;
  forEachBox(moov, [&](std::string_view type, std::span<const std::uint8_t> body, auto) {
    if (type == "trak") readTrackBoxes(body, tracks.emplace_back());
  });
  for (const TrackFormat& format : tracks) {
    if (format.timescale == 0 || format.sampleDescription.empty()) return {};
  }
  return tracks;
}

/// Adds one track fragment to the index. @param moofStart  file offset that the data offset counts from
bool readTrackFragment(std::span<const std::uint8_t> traf, std::uint64_t moofStart, MovieIndex& index) {
  std::uint32_t number = 0;
  bool good = true;
  forEachBox(traf, [&](std::string_view type, std::span<const std::uint8_t> body, auto) {
    Reader reader(body);
    reader.u32();
    if (type == "tfhd") number = reader.u32();
    if (type != "trun") return;
    if (number == 0 || number > index.tracks.size()) {
      good = false;
      return;
    }
    TrackIndex& track = index.tracks[number - 1];
    const std::uint32_t count = reader.u32();
    track.chunks.push_back({moofStart + reader.u32(), 0});
    for (std::uint32_t i = 0; i < count && reader.ok(); ++i) {
      const std::uint32_t duration = reader.u32();
      const std::uint32_t size = reader.u32();
      const std::uint32_t flags = reader.u32();
      if (reader.ok()) track.addSample(size, duration, (flags & 0x00010000U) == 0);
    }
    good = good && reader.ok();
  });
  return good;
}

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

class FileBoxes {
 public:
  explicit FileBoxes(int fd) : fd_(fd) {
    struct stat info {};
    if (fstat(fd, &info) == 0) size_ = static_cast<std::uint64_t>(info.st_size);
  }
  struct Box {
    std::string type;
    std::uint64_t size = 0;
  };
  /// The box that starts at `at`, when all of it is in the file.
  [[nodiscard]] std::optional<Box> boxAt(std::uint64_t at) const {
    std::uint8_t head[8];
    if (at + 8 > size_ || pread(fd_, head, 8, static_cast<off_t>(at)) != 8) return std::nullopt;
    Reader reader(head);
    const std::uint32_t size = reader.u32();
    const auto type = reader.take(4);
    if (size < 8 || size > size_ - at) return std::nullopt;
    return Box{std::string(type.begin(), type.end()), size};
  }
  [[nodiscard]] Bytes body(std::uint64_t at, const Box& box) const {
    if (box.size > kHeaderLimit) return {};
    Bytes bytes(box.size - 8);
    const ssize_t n = pread(fd_, bytes.data(), bytes.size(), static_cast<off_t>(at + 8));
    if (n != static_cast<ssize_t>(bytes.size())) bytes.clear();
    return bytes;
  }

 private:
  int fd_;
  std::uint64_t size_ = 0;
};

}  // namespace

std::optional<MovieIndex> readMovieIndex(const std::string& path) {
  const UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!file.valid()) return std::nullopt;
  const FileBoxes boxes(file.get());
  std::uint64_t at = kFileTypeSize + kPlaceholderSize;
  const auto moov = boxes.boxAt(at);
  if (!moov || moov->type != "moov") return std::nullopt;
  MovieIndex index;
  for (TrackFormat& format : readTracks(boxes.body(at, *moov)))
    index.tracks.push_back({.format = std::move(format)});
  if (index.tracks.empty()) return std::nullopt;
  at += moov->size;
  index.mediaEnd = at;
  while (const auto moof = boxes.boxAt(at)) {
    if (moof->type != "moof") break;
    const auto mdat = boxes.boxAt(at + moof->size);
    if (!mdat || mdat->type != "mdat") break;
    MovieIndex fragment;  // joined to the index only when all of it reads well
    for (const TrackIndex& track : index.tracks) fragment.tracks.push_back({.format = track.format});
    bool good = true;
    forEachBox(boxes.body(at, *moof), [&](std::string_view type, std::span<const std::uint8_t> body, auto) {
      if (type == "traf") good = good && readTrackFragment(body, at, fragment);
    });
    if (!good) break;
    for (std::size_t i = 0; i < index.tracks.size(); ++i) join(index.tracks[i], fragment.tracks[i]);
    at += moof->size + mdat->size;
    index.mediaEnd = at;
  }
  return index;
}

}  // namespace lmx

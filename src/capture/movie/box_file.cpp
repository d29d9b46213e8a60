// Finds boxes in a file.
#include "capture/movie/box_file.h"

#include <sys/stat.h>

#include <array>

#include "capture/movie/box_reader.h"
#include "capture/movie/file_io.h"

namespace lmx {
namespace {

constexpr std::uint64_t kHeaderLimit = 16U << 20;  // moov and moof of ours are far smaller

}  // namespace

BoxFile::BoxFile(int fd) : fd_(fd) {
  struct stat info {};
  if (fstat(fd, &info) == 0) size_ = static_cast<std::uint64_t>(info.st_size);
}

std::optional<BoxFile::Box> BoxFile::boxAt(std::uint64_t at, const char* type) const {
  std::array<std::uint8_t, kHeadSize> head{};
  if (at + kHeadSize > size_ || readAllAt(fd_, head, at) != 0) return std::nullopt;
  BoxReader reader(head);
  const std::uint32_t size = reader.u32();
  const auto name = reader.take(4);
  Box box{std::string(name.begin(), name.end()), at, size};
  if (size < kHeadSize || size > size_ - at || box.type != type) return std::nullopt;
  return box;
}

Bytes BoxFile::body(const Box& box) const {
  if (box.size > kHeaderLimit) return {};
  Bytes bytes(box.size - kHeadSize);
  if (readAllAt(fd_, bytes, box.bodyStart()) != 0) bytes.clear();
  return bytes;
}

}  // namespace lmx

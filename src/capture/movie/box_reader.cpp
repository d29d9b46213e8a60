// Reads big-endian fields within bounds.
#include "capture/movie/box_reader.h"

namespace lmx {

std::uint32_t BoxReader::u32() {
  const auto b = take(4);
  if (b.empty()) return 0;
  return static_cast<std::uint32_t>(b[0]) << 24 | static_cast<std::uint32_t>(b[1]) << 16 |
         static_cast<std::uint32_t>(b[2]) << 8 | b[3];
}

std::uint64_t BoxReader::u64() {
  const std::uint64_t high = u32();
  return high << 32 | u32();
}

std::span<const std::uint8_t> BoxReader::take(std::size_t n) {
  if (n > bytes_.size()) {
    ok_ = false;
    bytes_ = {};
    return {};
  }
  const auto part = bytes_.first(n);
  bytes_ = bytes_.subspan(n);
  return part;
}

}  // namespace lmx

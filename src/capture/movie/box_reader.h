// Reads the boxes of a movie file, trusting nothing. Pure.
#pragma once
#include <cstdint>
#include <span>
#include <string_view>

namespace lmx {

/// Bounds-checked reading of big-endian fields. A read behind the end yields 0 and clears ok().
class BoxReader {
 public:
  explicit BoxReader(std::span<const std::uint8_t> bytes) : bytes_(bytes) {}
  [[nodiscard]] bool ok() const { return ok_; }
  std::uint32_t u32();
  std::uint64_t u64();
  /// The next `n` bytes; empty when there are not so many.
  std::span<const std::uint8_t> take(std::size_t n);

 private:
  std::span<const std::uint8_t> bytes_;  ///< what is left
  bool ok_ = true;
};

/// Calls visit(type, body, wholeBox) for each box in `bytes`; stops at a malformed one.
template <class Visit>
void forEachBox(std::span<const std::uint8_t> bytes, Visit visit) {
  while (bytes.size() >= 8) {
    BoxReader reader(bytes);
    const std::uint32_t size = reader.u32();
    const auto type = reader.take(4);
    if (size < 8 || size > bytes.size()) return;
    visit(std::string_view(reinterpret_cast<const char*>(type.data()), 4), bytes.subspan(8, size - 8),
          bytes.first(size));
    bytes = bytes.subspan(size);
  }
}

}  // namespace lmx

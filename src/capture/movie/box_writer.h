// Writes the boxes of a movie file: big-endian fields inside nested, sized boxes. Pure.
#pragma once
#include <cstdint>
#include <span>
#include <string_view>

#include "capture/movie/movie_index.h"

namespace lmx {

/// Appends to a buffer; a box gets its size when its body has been written.
class BoxWriter {
 public:
  /// @param out  must outlive the writer
  explicit BoxWriter(Bytes& out) : out_(out) {}

  /// Writes a box of the four characters `type`; `body` writes what it contains.
  template <class Body>
  void box(std::string_view type, Body body) {
    const std::size_t start = out_.size();
    u32(0);
    text(type);
    body();
    patch32(start, static_cast<std::uint32_t>(out_.size() - start));
  }
  /// A box that begins with a version and 24 bits of flags.
  template <class Body>
  void fullBox(std::string_view type, std::uint8_t version, std::uint32_t flags, Body body) {
    box(type, [&] {
      u32(static_cast<std::uint32_t>(version) << 24 | flags);
      body();
    });
  }
  void u8(unsigned v);
  void u16(unsigned v);
  void u32(std::uint32_t v);
  void u64(std::uint64_t v);
  void zeros(std::size_t n);
  void text(std::string_view t);
  void bytes(std::span<const std::uint8_t> b);

  /// Size of the buffer, where the next field will be.
  [[nodiscard]] std::size_t size() const { return out_.size(); }
  /// Overwrites the four bytes at `at`.
  void patch32(std::size_t at, std::uint32_t v);

 private:
  Bytes& out_;
};

}  // namespace lmx

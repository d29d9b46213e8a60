// Writes big-endian fields.
#include "capture/movie/box_writer.h"

namespace lmx {

void BoxWriter::u8(unsigned v) { out_.push_back(static_cast<std::uint8_t>(v)); }

void BoxWriter::u16(unsigned v) {
  u8(v >> 8 & 0xFF);
  u8(v & 0xFF);
}

void BoxWriter::u32(std::uint32_t v) {
  u16(v >> 16);
  u16(v & 0xFFFF);
}

void BoxWriter::u64(std::uint64_t v) {
  u32(static_cast<std::uint32_t>(v >> 32));
  u32(static_cast<std::uint32_t>(v));
}

void BoxWriter::zeros(std::size_t n) { out_.insert(out_.end(), n, 0); }
void BoxWriter::text(std::string_view t) { out_.insert(out_.end(), t.begin(), t.end()); }
void BoxWriter::bytes(std::span<const std::uint8_t> b) { out_.insert(out_.end(), b.begin(), b.end()); }

void BoxWriter::patch32(std::size_t at, std::uint32_t v) {
  for (std::size_t i = 0; i < 4; ++i) out_[at + i] = static_cast<std::uint8_t>(v >> (24 - 8 * i));
}

}  // namespace lmx

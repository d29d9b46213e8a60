// Reads the headers of payloads as the depayloaders do.
#include "capture/media/rtp_payload.h"

#include <algorithm>
#include <initializer_list>
#include <optional>

namespace lmx {
namespace {

using Payload = std::span<const std::uint8_t>;

constexpr int kWidest = 32;  // bits of a field
constexpr unsigned kCountedBits =
    16;  // the depayloader counts a header for each so many, however long they are

unsigned twoBytes(Payload bytes) { return static_cast<unsigned>(bytes[0]) << 8 | bytes[1]; }

class BitReader {
 public:
  explicit BitReader(Payload bytes) : bytes_(bytes) {}

  /// @param bits  at most 32
  /// @return nothing when there are not that many
  std::optional<std::uint32_t> read(int bits) {
    if (at_ + static_cast<std::size_t>(bits) > bytes_.size() * 8) return std::nullopt;
    std::uint32_t value = 0;
    for (int i = 0; i < bits; ++i, ++at_) value = value << 1 | (bytes_[at_ / 8] >> (7 - at_ % 8) & 1U);
    return value;
  }
  bool skip(int bits) { return read(bits).has_value(); }
  /// Of a field that is there only if the bit before it says so.
  bool skipOptional(int bits) {
    if (bits == 0) return true;
    const auto there = read(1);
    return there && (*there == 0 || skip(bits));
  }

 private:
  Payload bytes_;
  std::size_t at_ = 0;
};

bool sensible(const AccessUnitLayout& layout) {
  const auto fits = [](int bits) { return bits >= 0 && bits <= kWidest; };
  const std::initializer_list<int> widths = {layout.size,        layout.index,        layout.indexDelta,
                                             layout.ctsDelta,    layout.dtsDelta,     layout.randomAccess,
                                             layout.streamState, layout.auxiliarySize};
  return std::all_of(widths.begin(), widths.end(), fits);
}

/// @return the access unit's size in bytes, nothing when the header isn't complete
std::optional<std::uint32_t> readHeader(BitReader& bits, const AccessUnitLayout& layout, bool first) {
  const auto size = bits.read(layout.size);
  const bool complete = size && bits.skip(first ? layout.index : layout.indexDelta) &&
                        bits.skipOptional(layout.ctsDelta) && bits.skipOptional(layout.dtsDelta) &&
                        bits.skip(layout.randomAccess) && bits.skip(layout.streamState);
  return complete ? size : std::nullopt;
}

}  // namespace

bool harmlessAccessUnits(Payload payload, const AccessUnitLayout& layout) {
  if (payload.empty() || !sensible(layout)) return false;
  if (layout.size == 0) return true;
  if (payload.size() < 2) return false;
  const unsigned headerBits = twoBytes(payload);
  const Payload headers = payload.subspan(2);
  const std::size_t headerBytes = (headerBits + 7) / 8;
  if (headers.size() < headerBytes) return false;
  std::size_t left = headers.size() - headerBytes;
  if (layout.auxiliarySize != 0) {
    const auto bits = BitReader(headers.subspan(headerBytes)).read(layout.auxiliarySize);
    if (!bits || (std::uint64_t{*bits} + 7) / 8 > left) return false;
    left -= static_cast<std::size_t>((std::uint64_t{*bits} + 7) / 8);
  }
  // Beyond its end the headers' part is read on into what follows, as long as units are left.
  BitReader bits(headers);
  for (unsigned i = 0; i < headerBits / kCountedBits && left > 0; ++i) {
    const auto size = readHeader(bits, layout, i == 0);
    if (size.value_or(0) == 0) return false;     // it would take an empty unit and write to it
    left -= std::min<std::size_t>(*size, left);  // of a part of a unit it is the size of the whole
  }
  return true;
}

bool harmlessH264(Payload payload) {
  if (payload.empty()) return false;
  const int type = payload[0] & 0x1F;
  if (type == 26 || type == 27) return false;  // several times in one packet: it would give up for good
  const bool fragment = type == 28 || type == 29;
  return !fragment || payload.size() >= 2;
}

bool harmlessH265(Payload payload) {
  if (payload.size() < 2) return false;
  const int type = payload[0] >> 1 & 0x3F;
  if (type == 50) return false;  // further headers: it would give up for good
  return type != 49 || payload.size() >= 3;
}

bool harmlessJpeg(Payload payload) {
  constexpr std::size_t kMainHeader = 8;
  constexpr std::size_t kRestartHeader = 4;
  constexpr std::size_t kTableHeader = 4;
  if (payload.size() < kMainHeader) return false;
  const bool begins = payload[1] == 0 && payload[2] == 0 && payload[3] == 0;
  const std::size_t header = kMainHeader + (payload[4] > 63 ? kRestartHeader : 0);
  const bool ownTables = payload[5] >= 128 && begins;
  if (!ownTables) return payload.size() > header;
  if (payload.size() < header + kTableHeader) return false;
  const Payload tables = payload.subspan(header + kTableHeader);
  const unsigned precision = payload[header + 1];
  const std::size_t stated = twoBytes(payload.subspan(header + 2));
  // Two are read, whatever the length says.
  const std::size_t taken =
      stated == 0 ? 0 : ((precision & 1U) != 0 ? 128 : 64) + ((precision & 2U) != 0 ? 128 : 64);
  return tables.size() > stated && tables.size() >= taken;
}

}  // namespace lmx

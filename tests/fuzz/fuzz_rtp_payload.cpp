// Feeds arbitrary payloads of RTP packets to the checks before the depayloaders.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>

#include "capture/media/rtp_payload.h"

namespace {

using Payload = std::span<const std::uint8_t>;

constexpr lmx::AccessUnitLayout kUsual{.size = 13, .index = 3, .indexDelta = 3};

void require(bool holds) {
  if (!holds) std::abort();
}

/// Widths from -2 to 33 bits, as a camera may describe them.
lmx::AccessUnitLayout layoutFrom(std::span<const std::uint8_t, 8> bytes) {
  const auto width = [&](std::size_t place) { return bytes[place] % 36 - 2; };
  return {width(0), width(1), width(2), width(3), width(4), bytes[5] % 2, width(6), width(7)};
}

/// Whether the first access unit of the usual layout has no bytes though some are left for it.
bool beginsEmpty(Payload payload) {
  if (payload.size() < 5) return false;
  const std::size_t bits = static_cast<std::size_t>(payload[0]) << 8 | payload[1];
  const bool header = bits >= 16 && 2 + (bits + 7) / 8 < payload.size();
  return header && payload[2] == 0 && payload[3] < 8;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Payload input(data, size);
  const bool usual = lmx::harmlessAccessUnits(input, kUsual);
  require(!usual || (size >= 2 && !beginsEmpty(input)));
  if (size >= 8) lmx::harmlessAccessUnits(input.subspan(8), layoutFrom(input.first<8>()));
  require(!lmx::harmlessH264(input) || size >= 1);
  require(!lmx::harmlessH265(input) || size >= 2);
  require(!lmx::harmlessJpeg(input) || size >= 9);
  return 0;
}

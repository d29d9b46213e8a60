// Which payloads a depayloader may be given.
#include "capture/media/rtp_payload.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace lmx {
namespace {

using Payload = std::vector<std::uint8_t>;

constexpr AccessUnitLayout kUsual{.size = 13, .index = 3, .indexDelta = 3};

struct Units {
  const char* name;
  Payload payload;
  bool harmless;
  AccessUnitLayout layout = kUsual;
};

void PrintTo(const Units& units, std::ostream* out) { *out << units.name; }

class AccessUnits : public testing::TestWithParam<Units> {};

TEST_P(AccessUnits, AreTakenOrNot) {
  EXPECT_EQ(harmlessAccessUnits(GetParam().payload, GetParam().layout), GetParam().harmless);
}

// A header of 13 + 3 bits says eight times the size.
INSTANTIATE_TEST_SUITE_P(
    RtpPayload, AccessUnits,
    testing::Values(
        Units{"one", {0, 16, 0, 16, 1, 2}, true}, Units{"two", {0, 32, 0, 8, 0, 16, 1, 2, 3}, true},
        Units{"part of a larger one", {0, 16, 1, 0, 1, 2, 3}, true}, Units{"empty", {}, false},
        Units{"half a length", {0}, false}, Units{"headers longer than the packet", {0, 40, 0, 8, 1}, false},
        Units{"headers that fill the packet", {0, 16, 0, 8}, true},
        Units{"size 0", {0, 16, 0, 0, 1, 2}, false}, Units{"size 0, index 1", {0, 16, 0, 1, 1, 2}, false},
        Units{"second of size 0", {0, 32, 0, 8, 0, 0, 1, 2, 3}, false},
        Units{"second of size 0, nothing left for it", {0, 32, 0, 8, 0, 0, 1}, true},
        Units{"no header", {0, 0, 1, 2}, true}, Units{"less than a header", {0, 15, 0, 0, 1, 2}, true},
        Units{"no headers in this stream", {0, 0}, true, {}}, Units{"nothing at all in it", {}, false, {}},
        Units{"short headers, counted by 16 bits",
              {0, 16, 4, 4, 1, 2},
              true,
              {.size = 6, .index = 2, .indexDelta = 2}},
        Units{"short header of size 0", {0, 16, 3, 4, 1, 2}, false, {.size = 6, .index = 2, .indexDelta = 2}},
        // One header of 32 bits, counted as two: the second is read from the unit, and none when that is
        // used up.
        Units{"long header", {0, 32, 0, 8, 0, 0, 7}, true, {.size = 13, .index = 19}},
        Units{"long header, more than its unit",
              {0, 32, 0, 8, 0, 0, 0, 0, 0, 0, 0},
              false,
              {.size = 13, .index = 19}},
        Units{"long header, the packet ends within the second",
              {0, 32, 0, 8, 0, 0, 1, 2},
              false,
              {.size = 13, .index = 19, .indexDelta = 19}},
        Units{"times, none given",
              {0, 18, 0, 16, 0, 1, 2},
              true,
              {.size = 13, .index = 3, .ctsDelta = 8, .dtsDelta = 8}},
        // The first unit's header has 13 + 3 + 1 + 8 bits, the second's size begins in the middle of a byte.
        Units{"a time, then size 0",
              {0, 48, 0, 8, 0x80, 0, 0, 0, 1, 2},
              false,
              {.size = 13, .index = 3, .indexDelta = 3, .ctsDelta = 8}},
        Units{"a time, then size 1",
              {0, 48, 0, 8, 0x80, 0, 8, 0, 1, 2},
              true,
              {.size = 13, .index = 3, .indexDelta = 3, .ctsDelta = 8}},
        Units{"key flag and state, then size 0",
              {0, 32, 0, 8, 0x80, 0, 1, 2},
              false,
              {.size = 13, .index = 3, .indexDelta = 3, .randomAccess = 1, .streamState = 2}},
        Units{"further data", {0, 16, 0, 8, 8, 1, 2}, true, {.size = 13, .index = 3, .auxiliarySize = 8}},
        Units{"further data longer than the packet",
              {0, 16, 0, 8, 24, 1},
              false,
              {.size = 13, .index = 3, .auxiliarySize = 8}},
        Units{"further data with the greatest size",
              {0, 16, 0, 8, 255, 255, 255, 255, 1},
              false,
              {.size = 13, .index = 3, .auxiliarySize = 32}},
        Units{"further data whose size is cut",
              {0, 16, 0, 8, 1},
              false,
              {.size = 13, .index = 3, .auxiliarySize = 16}},
        Units{"a field below 0", {0, 16, 0, 8, 1}, false, {.size = 13, .index = -3}},
        Units{"a field beyond 32", {0, 16, 0, 8, 1, 2, 3, 4, 5}, false, {.size = 33}},
        Units{"a size below 0", {0, 16, 0, 8, 1}, false, {.size = -1}}));

struct Other {
  const char* name;
  bool (*check)(std::span<const std::uint8_t>);
  Payload payload;
  bool harmless;
};

void PrintTo(const Other& other, std::ostream* out) { *out << other.name; }

class Pictures : public testing::TestWithParam<Other> {};

TEST_P(Pictures, AreTakenOrNot) { EXPECT_EQ(GetParam().check(GetParam().payload), GetParam().harmless); }

/// The beginning of a JPEG picture with so many bytes behind its headers.
Payload jpeg(std::uint8_t type, std::uint8_t quality, const Payload& more, std::size_t bytes) {
  Payload payload = {0, 0, 0, 0, type, quality, 40, 22};
  payload.insert(payload.end(), more.begin(), more.end());
  payload.resize(payload.size() + bytes);
  return payload;
}

INSTANTIATE_TEST_SUITE_P(
    RtpPayload, Pictures,
    testing::Values(
        Other{"H.264, empty", harmlessH264, {}, false}, Other{"H.264, one byte", harmlessH264, {0x65}, true},
        Other{"H.264, fragment without its header", harmlessH264, {0x7C}, false},
        Other{"H.264, fragment with a number, without its header", harmlessH264, {0x7D}, false},
        Other{"H.264, fragment", harmlessH264, {0x7C, 0x85}, true},
        Other{"H.264, several", harmlessH264, {0x78, 0, 1, 0x65}, true},
        Other{"H.264, several times", harmlessH264, {0x7A, 0, 0, 0, 1, 0x65}, false},
        Other{"H.264, several distant times", harmlessH264, {0x7B, 0, 0, 0, 1, 0x65}, false},
        Other{"H.265, empty", harmlessH265, {}, false},
        Other{"H.265, half a header", harmlessH265, {0x26}, false},
        Other{"H.265, header", harmlessH265, {0x26, 1}, true},
        Other{"H.265, fragment without its header", harmlessH265, {0x62, 1}, false},
        Other{"H.265, fragment", harmlessH265, {0x62, 1, 0x93}, true},
        Other{"H.265, further headers", harmlessH265, {0x64, 1, 0, 0, 0}, false},
        Other{"JPEG, half a header", harmlessJpeg, {0, 0, 0, 0, 1, 50, 40}, false},
        Other{"JPEG, a header and nothing else", harmlessJpeg, jpeg(1, 50, {}, 0), false},
        Other{"JPEG", harmlessJpeg, jpeg(1, 50, {}, 1), true},
        Other{"JPEG, restart header cut", harmlessJpeg, jpeg(65, 50, {}, 4), false},
        Other{"JPEG, restart header", harmlessJpeg, jpeg(65, 50, {}, 5), true},
        Other{"JPEG, table header cut", harmlessJpeg, jpeg(1, 200, {0, 0, 0}, 0), false},
        Other{"JPEG, tables as before", harmlessJpeg, jpeg(1, 200, {0, 0, 0, 0}, 1), true},
        Other{"JPEG, tables", harmlessJpeg, jpeg(1, 200, {0, 0, 0, 128}, 129), true},
        Other{"JPEG, tables and nothing else", harmlessJpeg, jpeg(1, 200, {0, 0, 0, 128}, 128), false},
        Other{"JPEG, tables said to be short", harmlessJpeg, jpeg(1, 200, {0, 0, 0, 1}, 127), false},
        Other{"JPEG, tables said to be short, in a long packet", harmlessJpeg,
              jpeg(1, 200, {0, 0, 0, 1}, 128), true},
        Other{"JPEG, wide tables", harmlessJpeg, jpeg(1, 200, {0, 3, 1, 0}, 257), true},
        Other{"JPEG, wide tables in a short packet", harmlessJpeg, jpeg(1, 200, {0, 3, 0, 128}, 255), false},
        Other{"JPEG, tables behind a restart header", harmlessJpeg,
              jpeg(65, 200, {0, 0, 0, 0, 0, 0, 0, 128}, 129), true},
        Other{"JPEG, going on, without tables", harmlessJpeg, {0, 0, 4, 0, 1, 200, 40, 22, 1}, true}));

}  // namespace
}  // namespace lmx

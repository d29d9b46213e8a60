// Which JPEG pictures the decoder may be given.
#include "capture/media/jpeg_picture.h"

#include <gtest/gtest.h>

#include <initializer_list>
#include <vector>

namespace lmx {
namespace {

using Bytes = std::vector<std::uint8_t>;

const Bytes kBegin = {0xFF, 0xD8};
const Bytes kScan = {0xFF, 0xDA, 0, 2, 1, 2, 3, 0xFF, 0xD9};

Bytes joined(std::initializer_list<Bytes> parts) {
  Bytes all;
  for (const Bytes& part : parts) all.insert(all.end(), part.begin(), part.end());
  return all;
}

/// What describes a frame of one component.
Bytes frame(unsigned width, unsigned height, unsigned verticalSamples = 2, std::uint8_t marker = 0xC0) {
  const auto byte = [](unsigned value) { return static_cast<std::uint8_t>(value & 0xFF); };
  return {0xFF,
          marker,
          0,
          11,
          8,
          byte(height >> 8),
          byte(height),
          byte(width >> 8),
          byte(width),
          1,
          1,
          byte(0x20 | verticalSamples),
          0};
}

Bytes picture(unsigned width, unsigned height, unsigned verticalSamples = 2) {
  return joined({kBegin, frame(width, height, verticalSamples), kScan});
}

struct Case {
  const char* name;
  Bytes picture;
  bool harmless;
  int width = 320;
  int height = 224;
};

void PrintTo(const Case& one, std::ostream* out) { *out << one.name; }

class JpegPicture : public testing::TestWithParam<Case> {};

TEST_P(JpegPicture, IsGivenOrNot) {
  EXPECT_EQ(harmlessJpegPicture(GetParam().picture, GetParam().width, GetParam().height),
            GetParam().harmless);
}

/// One whose components are sampled so.
Bytes sampled(std::initializer_list<std::uint8_t> components) {
  const auto count = static_cast<std::uint8_t>(components.size());
  Bytes all = {0xFF, 0xC0, 0, static_cast<std::uint8_t>(8 + 3 * count), 8, 0, 224, 1, 64, count};
  for (const std::uint8_t one : components) all.insert(all.end(), {0, one, 0});
  return joined({kBegin, all, kScan});
}

INSTANTIATE_TEST_SUITE_P(Sampling, JpegPicture,
                         testing::Values(Case{"4:2:0", sampled({0x22, 0x11, 0x11}), true},
                                         Case{"4:2:2", sampled({0x21, 0x11, 0x11}), true},
                                         Case{"4:1:1", sampled({0x41, 0x11, 0x11}), true},
                                         Case{"4:4:4", sampled({0x11, 0x11, 0x11}), true},
                                         Case{"grey", sampled({0x11}), true},
                                         Case{"nothing", sampled({}), false},
                                         Case{"two components", sampled({0x22, 0x11}), false},
                                         Case{"four components", sampled({0x22, 0x11, 0x11, 0x11}), false},
                                         Case{"four rows", sampled({0x24, 0x11, 0x11}), false},
                                         Case{"eight columns", sampled({0x82, 0x11, 0x11}), false},
                                         Case{"more colour than light", sampled({0x11, 0x11, 0x12}), false},
                                         Case{"no columns of a colour", sampled({0x22, 0x01, 0x11}), false},
                                         Case{"no rows of a colour", sampled({0x22, 0x11, 0x10}), false}));

INSTANTIATE_TEST_SUITE_P(Size, JpegPicture,
                         testing::Values(Case{"as stated", picture(320, 224), true},
                                         Case{"nothing stated", picture(320, 224), true, 0, 0},
                                         Case{"higher", picture(320, 225), true},
                                         Case{"a line lower", picture(320, 223), false},
                                         Case{"lower", picture(320, 176), false},
                                         Case{"a field alone", picture(320, 112), false},
                                         Case{"less than a field", picture(320, 111), true},
                                         Case{"narrower and lower", picture(304, 176), true},
                                         Case{"the largest", picture(8192, 8192), true},
                                         Case{"too large", picture(8192, 8193), false},
                                         Case{"as large as can be", picture(65535, 65535), false}));

INSTANTIATE_TEST_SUITE_P(
    TwoFields, JpegPicture,
    testing::Values(
        Case{"of a multiple of the lines written at once", joined({picture(320, 112), picture(320, 112)}),
             true},
        Case{"apart", joined({picture(320, 112), {0, 0xFF, 0}, picture(320, 112)}), true},
        Case{"1080 lines", joined({picture(1920, 540), picture(1920, 540)}), true, 1920, 1080},
        Case{"no multiple of 16", joined({picture(320, 120), picture(320, 120)}), false, 320, 240},
        Case{"a multiple of 8", joined({picture(320, 120, 1), picture(320, 120, 1)}), true, 320, 240},
        Case{"too high together", joined({picture(320, 128), picture(320, 128)}), false},
        Case{"the second lower", joined({picture(320, 112), picture(320, 96)}), false},
        Case{"the second higher", joined({picture(320, 112), picture(320, 128)}), false},
        Case{"the second narrower", joined({picture(320, 112), picture(304, 112)}), false},
        Case{"the second of other blocks", joined({picture(320, 112), picture(320, 112, 1)}), false},
        Case{"the second cut", joined({picture(320, 112), kBegin, {0xFF, 0xC0, 0}}), false},
        Case{"a third that is lower", joined({picture(320, 112), picture(320, 112), picture(320, 96)}),
             false}));

const Bytes kThumbnail = {0xFF, 0xE1, 0, 17, 0xFF, 0xC0, 0, 11, 8, 0, 176, 1, 64, 1, 1, 0x22, 0, 0, 0};

INSTANTIATE_TEST_SUITE_P(
    Headers, JpegPicture,
    testing::Values(
        Case{"none", {}, false}, Case{"half a beginning", {0xFF}, false}, Case{"a beginning", kBegin, false},
        Case{"no beginning", joined({frame(320, 224), kScan}), false},
        Case{"no frame", joined({kBegin, kScan}), false},
        Case{"frame behind the scan", joined({kBegin, kScan, frame(320, 224)}), false},
        Case{"frame behind the end", joined({kBegin, {0xFF, 0xD9}, frame(320, 224)}), false},
        Case{"begins twice", joined({kBegin, kBegin, frame(320, 224)}), false},
        Case{"frame of several scans", joined({kBegin, frame(320, 224, 2, 0xC2), kScan}), true},
        Case{"lower frame of several scans", joined({kBegin, frame(320, 176, 2, 0xC2), kScan}), false},
        Case{"lower, coded otherwise", joined({kBegin, frame(320, 176, 2, 0xC9), kScan}), false},
        Case{"Huffman table, no frame", joined({kBegin, frame(320, 176, 2, 0xC4), frame(320, 224)}), true},
        Case{"the first frame counts", joined({kBegin, frame(320, 176), frame(320, 224)}), false},
        Case{"no samples", picture(320, 224, 0), false},
        Case{"marks of their own before it", joined({kBegin, {0xFF, 0xD0, 0xFF, 0x01}, frame(320, 176)}),
             false},
        Case{"bytes between", joined({kBegin, {1, 2, 0xFF, 0, 3}, frame(320, 176)}), false},
        Case{"bytes between, harmless", joined({kBegin, {1, 2, 0xFF, 0, 3}, frame(320, 224)}), true},
        Case{"fill bytes", joined({kBegin, {0xFF, 0xFF}, frame(320, 176)}), false},
        Case{"lower preview within another header", joined({kBegin, kThumbnail, frame(320, 224)}), true},
        Case{"header longer than the picture", joined({kBegin, {0xFF, 0xE1, 1, 0}, frame(320, 224)}), false},
        Case{"header without its length", joined({kBegin, {0xFF, 0xE1, 0}}), false},
        Case{"header shorter than its length", joined({kBegin, {0xFF, 0xE1, 0, 1}, frame(320, 224)}), false},
        Case{"frame cut", joined({kBegin, {0xFF, 0xC0, 0, 10, 8, 0, 224, 1, 64, 1, 1, 0x22}}), false}));

}  // namespace
}  // namespace lmx

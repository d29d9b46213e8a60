// Colours from one way of writing them to another.
#include "capture/media/colour_matrix.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <vector>

namespace lmx {
namespace {

/// Planes of a 4:2:0 picture with rows that are longer than they need be.
struct Picture {
  Picture(int width, int height) {
    const auto size = [](int side, int rows) { return static_cast<std::size_t>((side + 5) * rows); };
    const int halfWidth = (width + 1) / 2;
    const int halfHeight = (height + 1) / 2;
    data = {std::vector<std::uint8_t>(size(width, height), 7),
            std::vector<std::uint8_t>(size(halfWidth, halfHeight), 7),
            std::vector<std::uint8_t>(size(halfWidth, halfHeight), 7)};
    stride = {width + 5, halfWidth + 5, halfWidth + 5};
  }
  void fill(std::size_t plane, int width, int height, std::uint8_t value) {
    for (int y = 0; y < height; ++y) {
      for (int x = 0; x < width; ++x) data[plane][static_cast<std::size_t>(y * stride[plane] + x)] = value;
    }
  }
  PlanesIn in() {
    return {{data[0].data(), data[1].data(), data[2].data()}, {stride[0], stride[1], stride[2]}};
  }
  PlanesOut out() {
    return {{data[0].data(), data[1].data(), data[2].data()}, {stride[0], stride[1], stride[2]}};
  }
  std::array<std::vector<std::uint8_t>, 3> data;
  std::array<int, 3> stride{};
};

using Colour = std::array<double, 3>;

/// The same conversion by the book, with exact numbers. Colours are 0…1, chroma ± 0.5.
Colour toRGB(const ColourCode& code, double y, double cb, double cr) {
  const double luma = code.fullRange ? y / 255 : (y - 16) / 219;
  const double scale = code.fullRange ? 255 : 224;
  const double r = luma + 2 * (1 - code.redWeight) * (cr - 128) / scale;
  const double b = luma + 2 * (1 - code.blueWeight) * (cb - 128) / scale;
  return {r, (luma - code.redWeight * r - code.blueWeight * b) / (1 - code.redWeight - code.blueWeight), b};
}
Colour fromRGB(const ColourCode& code, const Colour& rgb) {
  const double luma =
      code.redWeight * rgb[0] + (1 - code.redWeight - code.blueWeight) * rgb[1] + code.blueWeight * rgb[2];
  const double scale = code.fullRange ? 255 : 224;
  const double cb = 128 + scale * (rgb[2] - luma) / 2 / (1 - code.blueWeight);
  const double cr = 128 + scale * (rgb[0] - luma) / 2 / (1 - code.redWeight);
  return {code.fullRange ? 255 * luma : 16 + 219 * luma, cb, cr};
}

double clamped(double value) { return std::min(255.0, std::max(0.0, value)); }

TEST(ColourMatrix, IsWithinOneStepOfExactNumbers) {
  for (const ColourCode from :
       {kBT601, kBT601Full, ColourCode{0.2126, 0.0722, true}, ColourCode{0.2627, 0.0593, false}}) {
    const ColourMatrix matrix(from, kBT709);
    for (int y = 0; y < 256; y += 5) {
      for (int cb = 0; cb < 256; cb += 15) {
        for (int cr = 0; cr < 256; cr += 15) {
          Picture picture(2, 2);
          picture.fill(0, 2, 2, static_cast<std::uint8_t>(y));
          picture.fill(1, 1, 1, static_cast<std::uint8_t>(cb));
          picture.fill(2, 1, 1, static_cast<std::uint8_t>(cr));
          matrix.convert(picture.in(), picture.out(), 2, 2);
          const Colour exact = fromRGB(kBT709, toRGB(from, y, cb, cr));
          for (std::size_t plane = 0; plane < 3; ++plane)
            ASSERT_NEAR(picture.data[plane][0], clamped(exact[plane]), 0.8) << y << " " << cb << " " << cr;
        }
      }
    }
  }
}

TEST(ColourMatrix, GreyStaysGrey) {
  const ColourMatrix matrix(kBT601Full, kBT709);
  for (int y = 0; y < 256; ++y) {
    Picture picture(2, 2);
    picture.fill(0, 2, 2, static_cast<std::uint8_t>(y));
    picture.fill(1, 1, 1, 128);
    picture.fill(2, 1, 1, 128);
    matrix.convert(picture.in(), picture.out(), 2, 2);
    EXPECT_EQ(picture.data[1][0], 128);
    EXPECT_EQ(picture.data[2][0], 128);
    EXPECT_NEAR(picture.data[0][1], 16 + 219.0 * y / 255, 0.6);
  }
}

class Sizes : public ::testing::TestWithParam<std::pair<int, int>> {};
INSTANTIATE_TEST_SUITE_P(Odd, Sizes,
                         ::testing::Values(std::pair(1, 1), std::pair(3, 5), std::pair(16, 2),
                                           std::pair(511, 3), std::pair(513, 2), std::pair(1030, 4)));

TEST_P(Sizes, AreConvertedWholeAndNothingBeside) {
  const auto [width, height] = GetParam();
  Picture in(width, height);
  in.fill(0, width, height, 100);
  in.fill(1, (width + 1) / 2, (height + 1) / 2, 60);
  in.fill(2, (width + 1) / 2, (height + 1) / 2, 200);
  Picture out(width, height);
  ColourMatrix(kBT601Full, kBT709).convert(in.in(), out.out(), width, height);
  const Colour exact = fromRGB(kBT709, toRGB(kBT601Full, 100, 60, 200));
  for (std::size_t plane = 0; plane < 3; ++plane) {
    for (std::size_t at = 0; at < out.data[plane].size(); ++at) {
      const int x = static_cast<int>(at) % out.stride[plane];
      const bool inside = x < (plane == 0 ? width : (width + 1) / 2);
      ASSERT_NEAR(out.data[plane][at], inside ? exact[plane] : 7, 0.8) << plane << " " << at;
    }
  }
}

TEST_P(Sizes, OfRGBAreConvertedWholeAndNothingBeside) {
  const auto [width, height] = GetParam();
  std::vector<std::uint8_t> pixels;
  for (int i = 0; i < width * height; ++i) pixels.insert(pixels.end(), {30, 90, 220, 255});
  Picture out(width, height);
  RGBMatrix(true, kBT709).convert(pixels.data(), 4 * width, out.out(), width, height);
  const Colour exact = fromRGB(kBT709, {220.0 / 255, 90.0 / 255, 30.0 / 255});
  for (std::size_t plane = 0; plane < 3; ++plane) {
    for (std::size_t at = 0; at < out.data[plane].size(); ++at) {
      const int x = static_cast<int>(at) % out.stride[plane];
      const bool inside = x < (plane == 0 ? width : (width + 1) / 2);
      ASSERT_NEAR(out.data[plane][at], inside ? exact[plane] : 7, 0.8) << plane << " " << at;
    }
  }
}

TEST(RGBMatrix, IsWithinOneStepOfExactNumbers) {
  for (const bool full : {true, false}) {
    const RGBMatrix matrix(full, kBT709);
    for (int r = 0; r < 256; r += 17) {
      for (int g = 0; g < 256; g += 17) {
        for (int b = 0; b < 256; b += 17) {
          const auto byte = [](int value) { return static_cast<std::uint8_t>(value); };
          const std::array<std::uint8_t, 4> pixel{byte(b), byte(g), byte(r), 0};
          Picture out(1, 1);
          matrix.convert(pixel.data(), 4, out.out(), 1, 1);
          const auto part = [full](int value) { return full ? value / 255.0 : (value - 16) / 219.0; };
          const Colour exact = fromRGB(kBT709, {part(r), part(g), part(b)});
          for (std::size_t plane = 0; plane < 3; ++plane)
            ASSERT_NEAR(out.data[plane][0], clamped(exact[plane]), 0.8) << r << " " << g << " " << b;
        }
      }
    }
  }
}

}  // namespace
}  // namespace lmx

// Draws and reads the bit row, draws the clock.
#include "capture/source/test_picture.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>

#include "support/format.h"

namespace lmx {
namespace {

void fill(const LumaPlane& plane, int x, int y, int width, int height, std::uint8_t value) {
  const int right = std::min(plane.width, x + width);
  for (int row = y; row < std::min(plane.height, y + height); ++row) {
    auto line = plane.bytes.subspan(static_cast<std::size_t>(row) * static_cast<std::size_t>(plane.stride));
    std::fill(line.begin() + x, line.begin() + right, value);
  }
}

constexpr std::uint8_t kWhite = 235;
constexpr std::uint8_t kBlack = 16;

/// 3x5 pixels a glyph, one octal digit a row.
std::array<int, 5> glyph(char c) {
  static constexpr std::array<std::array<int, 5>, 10> kDigits{{{7, 5, 5, 5, 7},
                                                               {2, 6, 2, 2, 7},
                                                               {7, 1, 7, 4, 7},
                                                               {7, 1, 7, 1, 7},
                                                               {5, 5, 7, 1, 1},
                                                               {7, 4, 7, 1, 7},
                                                               {7, 4, 7, 5, 7},
                                                               {7, 1, 1, 1, 1},
                                                               {7, 5, 7, 5, 7},
                                                               {7, 5, 7, 1, 7}}};
  if (c >= '0' && c <= '9') return kDigits[static_cast<std::size_t>(c - '0')];
  if (c == ':') return {0, 2, 0, 2, 0};
  if (c == '.') return {0, 0, 0, 0, 2};
  return {};
}

}  // namespace

void drawFrameNumber(const LumaPlane& plane, std::uint32_t number) {
  const int cell = plane.width / 32;
  const int tall = plane.height / 18;
  for (int bit = 0; bit < 32; ++bit) {
    const bool one = (number >> (31 - bit) & 1U) != 0;
    fill(plane, bit * cell, 0, cell, tall, one ? kWhite : kBlack);
  }
}

std::uint32_t readFrameNumber(const LumaPlane& plane) {
  const int cell = plane.width / 32;
  const int row = plane.height / 36;
  std::uint32_t number = 0;
  for (int bit = 0; bit < 32; ++bit) {
    const auto at = static_cast<std::size_t>(row) * static_cast<std::size_t>(plane.stride) +
                    static_cast<std::size_t>(bit * cell + cell / 2);
    number = number << 1 | (plane.bytes[at] > 127 ? 1U : 0U);
  }
  return number;
}

void drawClock(const LumaPlane& plane, const std::string& text) {
  const int dot = std::max(1, plane.height / 50);
  const int top = plane.height - 7 * dot;
  fill(plane, 0, top - dot, std::min(plane.width, static_cast<int>(text.size()) * 4 * dot + dot), 7 * dot,
       kBlack);
  int x = dot;
  for (const char c : text) {
    const auto rows = glyph(c);
    for (int row = 0; row < 5; ++row) {
      for (int column = 0; column < 3; ++column) {
        if ((rows[static_cast<std::size_t>(row)] >> (2 - column) & 1) == 0 ||
            x + (column + 1) * dot > plane.width)
          continue;
        fill(plane, x + column * dot, top + row * dot, dot, dot, kWhite);
      }
    }
    x += 4 * dot;
  }
}

std::string clockText(double seconds) {
  const auto ms = static_cast<long long>(std::llround(seconds * 1000));
  return string_with_format("%02lld:%02lld:%02lld.%03lld", ms / 3600000, ms / 60000 % 60, ms / 1000 % 60,
                            ms % 1000);
}

}  // namespace lmx

// Draws what tests read back from the frames of the synthetic camera: a bit row with the frame number, and a
// clock. Pure.
#pragma once
#include <cstdint>
#include <span>
#include <string>

namespace lmx {

/// A luma plane.
struct LumaPlane {
  std::span<std::uint8_t> bytes;
  int width = 0;
  int height = 0;
  int stride = 0;
};

/// 32 cells across the top, each width/32 wide and height/18 tall, most significant bit left, white for 1.
void drawFrameNumber(const LumaPlane& plane, std::uint32_t number);
/// Reads the number back from the centres of the cells.
std::uint32_t readFrameNumber(const LumaPlane& plane);
/// Draws digits, ":" and "." in the lower left corner, about 1/10 of the picture high.
void drawClock(const LumaPlane& plane, const std::string& text);
/// Hours, minutes, seconds and milliseconds of `seconds`.
std::string clockText(double seconds);

}  // namespace lmx

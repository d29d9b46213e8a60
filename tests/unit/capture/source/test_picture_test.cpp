// The marks in synthetic frames.
#include "capture/source/test_picture.h"

#include <gtest/gtest.h>

#include <vector>

namespace lmx {
namespace {

TEST(TestPicture, FrameNumberSurvivesAnyValue) {
  std::vector<std::uint8_t> bytes(std::size_t{64} * 36, 90);
  const LumaPlane plane{bytes, 64, 36, 64};
  for (const std::uint32_t number : {0U, 1U, 0x80000000U, 0xFFFFFFFFU, 123456789U}) {
    drawFrameNumber(plane, number);
    EXPECT_EQ(readFrameNumber(plane), number);
  }
  EXPECT_EQ(clockText(3723.25), "01:02:03.250");
}

}  // namespace
}  // namespace lmx

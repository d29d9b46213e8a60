// Frame rates as fractions, sizes out of texts.
#include "capture/api/picture.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(FrameRate, TelevisionRatesAreExact) {
  EXPECT_EQ(frameRateFrom(30), (FrameRate{30, 1}));
  EXPECT_EQ(frameRateFrom(29.97), (FrameRate{30000, 1001}));
  EXPECT_EQ(frameRateFrom(23.976), (FrameRate{24000, 1001}));
  EXPECT_EQ(frameRateFrom(12.5), (FrameRate{12500, 1000}));
}

TEST(PictureSize, IsReadFromItsText) {
  EXPECT_EQ(pictureSizeFrom("1280x720"), (PictureSize{1280, 720}));
  EXPECT_EQ(pictureSizeFrom("64x64"), (PictureSize{64, 64}));
  EXPECT_EQ(pictureSizeFrom("1920x1080"), (PictureSize{1920, 1080}));
  for (const char* text : {"", "x", "1280", "1280x", "x720", "1280x720p", " 1280x720", "1280X720",
                           "1280 x 720", "-1280x-720", "63x64", "3840x2160", "1280x1081", "99999999999x720"})
    EXPECT_EQ(pictureSizeFrom(text), std::nullopt) << text;
}

}  // namespace
}  // namespace lmx

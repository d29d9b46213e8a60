// Sizes and rates of recordings.
#include "capture/gst/picture_format.h"

#include <gtest/gtest.h>

#include "capture/gst/gst_handles.h"

namespace lmx {
namespace {

CapsHandle capsFrom(const std::string& text) {
  ensureGStreamer();
  return CapsHandle(gst_caps_from_string(text.c_str()));
}

TEST(RecordedSize, IsEvenSquareAndWithinTheLimit) {
  struct {
    const char* caps;
    int width, height;
  } const kTable[] = {
      {"video/x-raw,width=1280,height=720", 1280, 720},
      {"video/x-raw,width=1920,height=1080,pixel-aspect-ratio=1/1", 1920, 1080},
      {"video/x-raw,width=3840,height=2160", 1920, 1080},
      {"video/x-raw,width=1600,height=1200", 1440, 1080},
      {"video/x-raw,width=1080,height=1920", 608, 1080},
      {"video/x-raw,width=641,height=361", 642, 362},
      {"video/x-raw,width=720,height=576,pixel-aspect-ratio=64/45", 1024, 576},
      {"video/x-raw,width=1440,height=1080,pixel-aspect-ratio=4/3", 1920, 1080},
      {"video/x-raw,width=720,height=480,pixel-aspect-ratio=8/9", 720, 540},
      {"video/x-raw,width=4,height=2", 16, 16},
      {"image/jpeg,width=1280,height=960", 1280, 960},
      {"video/x-raw", 1920, 1080},
      {"ANY", 1920, 1080},
  };
  for (const auto& row : kTable) {
    const PictureSize size = recordedSize(capsFrom(row.caps).get());
    EXPECT_EQ(std::pair(size.width, size.height), std::pair(row.width, row.height)) << row.caps;
  }
  const PictureSize small = recordedSize(capsFrom("video/x-raw,width=1920,height=1080").get(), {1280, 1280});
  EXPECT_EQ(std::pair(small.width, small.height), std::pair(1280, 720));
}

TEST(NominalRate, IsTheRoundOneThatIsMeant) {
  struct {
    const char* rate;
    std::optional<FrameRate> expected;
  } const kTable[] = {
      {"25/1", FrameRate{25, 1}},
      {"30000/1001", FrameRate{30000, 1001}},
      {"10000000/333333", FrameRate{30, 1}},
      {"10000000/333667", FrameRate{30000, 1001}},
      {"15/2", FrameRate{7500, 1000}},
      {"0/1", std::nullopt},
      {"[1/1, 30/1]", std::nullopt},
  };
  for (const auto& row : kTable)
    EXPECT_EQ(nominalRate(capsFrom(std::string("video/x-raw,framerate=") + row.rate).get()), row.expected)
        << row.rate;
  EXPECT_EQ(nominalRate(capsFrom("video/x-raw").get()), std::nullopt);
}

}  // namespace
}  // namespace lmx

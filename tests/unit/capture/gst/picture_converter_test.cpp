// From whatever a device delivers to the one form in which pictures are recorded.
#include "capture/gst/picture_converter.h"

#include <gtest/gtest.h>

#include "platform/log.h"
#include "tests/unit/capture/gst/colour_bars.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::barsPicture;
using testing::distanceFromBars;
using testing::RawPicture;
using testing::recordedBars;

constexpr double kNear = 3;  // of 255

std::string capsText(const std::string& format, int width, int height, const std::string& more = "") {
  return "video/x-raw,format=" + format + ",width=" + std::to_string(width) +
         ",height=" + std::to_string(height) + ",framerate=30/1" + more;
}

struct Coding {
  const char* name;
  const char* caps;  // what the caps say
  double red, blue;
  bool full;
};
constexpr Coding kTold601{"601", ",colorimetry=(string)bt601", 0.299, 0.114, false};
constexpr Coding kTold709{"709", ",colorimetry=(string)bt709", 0.2126, 0.0722, false};
constexpr Coding kJPEG{"jpeg", ",colorimetry=(string)1:4:0:0", 0.299, 0.114, true};
constexpr Coding kFull709{"709full", ",colorimetry=(string)1:3:5:1", 0.2126, 0.0722, true};
constexpr Coding kV4L2{"v4l2", ",colorimetry=(string)2:4:7:1", 0.299, 0.114, false};
constexpr Coding kUntold{"untold", "", 0.299, 0.114, false};
constexpr Coding kFullRGB{"full", "", 0, 0, true};
constexpr Coding kLimitedRGB{"limited", ",colorimetry=(string)2:1:7:1", 0, 0, false};

class Colours : public ::testing::TestWithParam<std::tuple<const char*, Coding>> {};

TEST_P(Colours, AreThoseOfTheCamera) {
  const auto& [format, coding] = GetParam();
  const RawPicture picture =
      barsPicture(capsText(format, 640, 360, coding.caps), coding.red, coding.blue, coding.full);
  ASSERT_TRUE(picture.buffer);
  PictureConverter converter({640, 360});
  const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
  ASSERT_TRUE(result);
  EXPECT_LE(distanceFromBars(recordedBars(result.get(), {640, 360})), kNear);
  EXPECT_EQ(GST_BUFFER_PTS(result.get()), 5 * GST_SECOND);
}

std::string nameOf(const ::testing::TestParamInfo<Colours::ParamType>& info) {
  return std::string(std::get<0>(info.param)) + "_" + std::get<1>(info.param).name;
}

INSTANTIATE_TEST_SUITE_P(YUV, Colours,
                         ::testing::Combine(::testing::Values("I420", "NV12", "YUY2", "UYVY", "Y42B", "Y444",
                                                              "AYUV", "I420_10LE", "P010_10LE", "I422_10LE"),
                                            ::testing::Values(kTold601, kTold709, kJPEG, kFull709, kV4L2,
                                                              kUntold)),
                         nameOf);
INSTANTIATE_TEST_SUITE_P(RGB, Colours,
                         ::testing::Combine(::testing::Values("RGB", "BGR", "BGRx", "BGRA", "ARGB", "GBR"),
                                            ::testing::Values(kFullRGB, kLimitedRGB)),
                         nameOf);

TEST(PictureConverter, ReadsALargeYUY2CamerasPictureAsBT601) {
  const RawPicture picture = barsPicture(capsText("YUY2", 1280, 720), 0.299, 0.114, false);
  PictureConverter converter({1280, 720});
  const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
  EXPECT_LE(distanceFromBars(recordedBars(result.get(), {1280, 720})), kNear);
}

TEST(PictureConverter, ReadsALargeStreamWithoutColoursAsBT709) {
  const RawPicture picture = barsPicture(
      capsText("I420", 1280, 720, ",interlace-mode=progressive,chroma-site=mpeg2"), 0.2126, 0.0722, false);
  PictureConverter converter({1280, 720});
  const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
  EXPECT_LE(distanceFromBars(recordedBars(result.get(), {1280, 720})), kNear);
}

TEST(PictureConverter, HandsOnWhatFitsAlready) {
  const RawPicture picture =
      barsPicture(capsText("I420", 640, 360, ",colorimetry=(string)bt709"), 0.2126, 0.0722, false);
  PictureConverter converter({640, 360});
  const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
  EXPECT_EQ(result.get(), picture.buffer.get());
}

TEST(PictureConverter, ScalesALargePicture) {
  const RawPicture picture =
      barsPicture(capsText("NV12", 1920, 1080, ",colorimetry=(string)bt709"), 0.2126, 0.0722, false);
  PictureConverter converter({640, 360});
  const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
  EXPECT_LE(distanceFromBars(recordedBars(result.get(), {640, 360})), kNear);
}

double lumaAt(GstBuffer* buffer, std::size_t offset) {
  std::uint8_t luma = 0;
  gst_buffer_extract(buffer, offset, &luma, 1);
  return luma;
}

TEST(PictureConverter, FitsAnotherShapeInWithBlackBars) {
  for (const char* format : {"I420", "YUY2", "RGB"}) {
    const bool rgb = std::string(format) == "RGB";
    const RawPicture picture = barsPicture(
        capsText(format, 320, 240, rgb ? "" : ",colorimetry=(string)1:4:0:0"), 0.299, 0.114, true);
    PictureConverter converter({640, 360});
    const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
    ASSERT_TRUE(result) << format;
    EXPECT_LE(distanceFromBars(recordedBars(result.get(), {640, 360}, {480, 360})), kNear) << format;
    EXPECT_NEAR(lumaAt(result.get(), 180 * 640 + 40), 16, 1) << format;
    EXPECT_NEAR(lumaAt(result.get(), 180 * 640 + 600), 16, 1) << format;
  }
}

TEST(PictureConverter, SquaresPixels) {
  const RawPicture picture = barsPicture(
      capsText("I420", 720, 576, ",pixel-aspect-ratio=64/45,colorimetry=(string)bt601"), 0.299, 0.114, false);
  EXPECT_EQ(recordedSize(picture.caps.get()).width, 1024);
  PictureConverter converter({1024, 576});
  const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
  EXPECT_LE(distanceFromBars(recordedBars(result.get(), {1024, 576})), kNear);
}

TEST(PictureConverter, TakesPixelsOfAnImpossibleShapeForSquareOnes) {
  for (const char* shape : {",pixel-aspect-ratio=-1/1", ",pixel-aspect-ratio=0/1"}) {
    const RawPicture picture = barsPicture(capsText("BGR", 640, 360, shape), 0, 0, true);
    EXPECT_EQ(recordedSize(picture.caps.get()), (PictureSize{640, 360}));
    PictureConverter converter({640, 360});
    const BufferHandle result = converter.convert(picture.buffer.get(), picture.caps.get());
    EXPECT_LE(distanceFromBars(recordedBars(result.get(), {640, 360})), kNear) << shape;
  }
}

TEST(PictureConverter, TellsAChangeOfFormatOnce) {
  const RawPicture first = barsPicture(capsText("I420", 640, 360), 0.299, 0.114, false);
  const RawPicture second = barsPicture(capsText("YUY2", 320, 240), 0.299, 0.114, false);
  PictureConverter converter({640, 360});
  converter.convert(first.buffer.get(), first.caps.get());
  EXPECT_EQ(converter.formatChange(), std::nullopt);
  EXPECT_TRUE(converter.convert(second.buffer.get(), second.caps.get()));
  EXPECT_EQ(converter.formatChange(), "640x360 I420 at 30 fps has become 320x240 YUY2 at 30 fps");
  EXPECT_EQ(converter.formatChange(), std::nullopt);
  const RawPicture again = barsPicture(capsText("YUY2", 320, 240), 0.299, 0.114, false);
  EXPECT_TRUE(converter.convert(again.buffer.get(), again.caps.get()));
  EXPECT_EQ(converter.formatChange(), std::nullopt);
  const std::string other = capsText("YUY2", 320, 240, ",colorimetry=bt601");
  const RawPicture recoloured = barsPicture(other, 0.299, 0.114, false);
  EXPECT_TRUE(converter.convert(recoloured.buffer.get(), recoloured.caps.get()));
  EXPECT_EQ(converter.formatChange(), std::nullopt) << "the words would be the same";
}

TEST(PictureConverter, RefusesWhatItCantReadWithALineForEachFormat) {
  const testing::LogCapture log;
  PictureConverter converter({640, 360});
  const RawPicture picture = barsPicture(capsText("I420", 640, 360), 0.299, 0.114, false);
  const CapsHandle encoded(gst_caps_from_string("image/jpeg,width=640,height=360"));
  for (int i = 0; i < 3; ++i) EXPECT_FALSE(converter.convert(picture.buffer.get(), encoded.get()));
  EXPECT_EQ(log.count(kLogError, "The camera's pictures can't be read: 640x360"), 1);
  const CapsHandle larger(gst_caps_from_string(capsText("I420", 1280, 720).c_str()));
  EXPECT_FALSE(converter.convert(picture.buffer.get(), larger.get())) << "the buffer is too short";
  EXPECT_EQ(log.count(kLogError, "The camera's pictures can't be read: 1280x720 I420 at 30 fps"), 1);
  EXPECT_TRUE(converter.convert(picture.buffer.get(), picture.caps.get()));
}

}  // namespace
}  // namespace lmx

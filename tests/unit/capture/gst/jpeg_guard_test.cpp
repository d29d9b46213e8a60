// Pictures that the JPEG decoder doesn't survive, given to a real one.
#include "capture/gst/jpeg_guard.h"

#include <gst/app/gstappsink.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

#include "capture/gst/gst_handles.h"
#include "tests/unit/capture/gst/guarded_element.h"

namespace lmx {
namespace {

using Bytes = std::vector<std::uint8_t>;

constexpr int kWidth = 320;
constexpr int kHeight = 224;  // a multiple of the lines that are decoded at once

Bytes jpeg(int height) {
  ensureGStreamer();
  const auto pipeline = newPipeline("videotestsrc num-buffers=1 ! video/x-raw,format=I420,width=320,height=" +
                                    std::to_string(height) + " ! jpegenc ! appsink name=sink sync=false");
  gst_element_set_state(pipeline->get(), GST_STATE_PLAYING);
  const GstHandle<GstElement> sink = elementNamed(pipeline->get(), "sink");
  Bytes bytes = testing::bytesOf(SampleHandle(gst_app_sink_pull_sample(GST_APP_SINK(sink.get()))));
  gst_element_set_state(pipeline->get(), GST_STATE_NULL);
  return bytes;
}

/// A decoder behind its guard, told that pictures have kWidth x kHeight.
class Decoder {
 public:
  void push(const Bytes& picture) {
    GstBuffer* buffer = gst_buffer_new_allocate(nullptr, picture.size(), nullptr);
    gst_buffer_fill(buffer, 0, picture.data(), picture.size());
    GST_BUFFER_PTS(buffer) = number_++ * 40 * GST_MSECOND;
    element_.push(buffer);
  }
  /// The heights of everything that has come out, once all pictures are through.
  std::vector<int> heights() {
    std::vector<int> all;
    for (const SampleHandle& sample : element_.result()) {
      int height = 0;
      gst_structure_get_int(gst_caps_get_structure(gst_sample_get_caps(sample.get()), 0), "height", &height);
      all.push_back(height);
    }
    return all;
  }

 private:
  testing::GuardedElement element_{guardJpegDecodersIn, "jpegdec",
                                   "image/jpeg,width=" + std::to_string(kWidth) +
                                       ",height=" + std::to_string(kHeight) + ",framerate=25/1"};
  GstClockTime number_ = 0;
};

TEST(JpegGuard, DropsAPictureThatIsTakenForAField) {
  Decoder decoder;
  for (const int height : {kHeight, 176, kHeight, 208, kHeight}) decoder.push(jpeg(height));
  EXPECT_EQ(decoder.heights(), (std::vector<int>{kHeight, kHeight, kHeight}));
}

TEST(JpegGuard, LeavesInterlacedPictures) {
  Bytes both = jpeg(kHeight / 2);
  both.insert(both.end(), both.begin(), both.begin() + static_cast<std::ptrdiff_t>(both.size()));
  Decoder decoder;
  decoder.push(both);
  EXPECT_EQ(decoder.heights(), std::vector<int>{kHeight});
}

TEST(JpegGuard, LeavesPicturesOfAnotherSize) {
  Decoder decoder;
  for (const int height : {96, 240, kHeight}) decoder.push(jpeg(height));
  EXPECT_EQ(decoder.heights(), (std::vector<int>{96, 240, kHeight}));
}

/// With some bytes changed; most of them in the header that describes the frame.
Bytes damaged(Bytes picture, std::minstd_rand& chance) {
  const auto below = [&](std::size_t limit) {
    return std::uniform_int_distribution<std::size_t>(0, limit - 1)(chance);
  };
  const Bytes mark = {0xFF, 0xC0, 0, 17};
  const auto frame = static_cast<std::size_t>(
      std::search(picture.begin(), picture.end(), mark.begin(), mark.end()) - picture.begin());
  for (auto changes = 1 + below(3); changes > 0; --changes) {
    const auto place = below(3) == 0 ? below(picture.size()) : frame + below(19);
    picture[place] = static_cast<std::uint8_t>(below(2) == 0 ? below(2) * 16 : below(256));
  }
  return picture;
}

TEST(JpegGuard, DamagedPicturesDoNoHarm) {
  constexpr std::size_t kRounds = 1500;
  Decoder decoder;
  const Bytes whole = jpeg(kHeight);
  std::minstd_rand chance(1);
  for (std::size_t i = 0; i < kRounds; ++i) {
    decoder.push(damaged(whole, chance));
    decoder.push(whole);
  }
  const auto heights = decoder.heights();
  EXPECT_GE(static_cast<std::size_t>(std::count(heights.begin(), heights.end(), kHeight)), kRounds);
}

}  // namespace
}  // namespace lmx

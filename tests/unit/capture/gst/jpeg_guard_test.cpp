// Pictures that the JPEG decoder doesn't survive, given to a real one.
#include "capture/gst/jpeg_guard.h"

#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

#include "capture/gst/gst_handles.h"

namespace lmx {
namespace {

using Bytes = std::vector<std::uint8_t>;

constexpr int kWidth = 320;
constexpr int kHeight = 224;  // a multiple of the lines that are decoded at once

SampleHandle pulled(GstElement* sink) { return SampleHandle(gst_app_sink_pull_sample(GST_APP_SINK(sink))); }

Bytes jpeg(int height) {
  ensureGStreamer();
  const auto pipeline = newPipeline("videotestsrc num-buffers=1 ! video/x-raw,format=I420,width=320,height=" +
                                    std::to_string(height) + " ! jpegenc ! appsink name=sink sync=false");
  gst_element_set_state(pipeline->get(), GST_STATE_PLAYING);
  const SampleHandle sample = pulled(elementNamed(pipeline->get(), "sink").get());
  GstBuffer* buffer = gst_sample_get_buffer(sample.get());
  Bytes bytes(gst_buffer_get_size(buffer));
  gst_buffer_extract(buffer, 0, bytes.data(), bytes.size());
  gst_element_set_state(pipeline->get(), GST_STATE_NULL);
  return bytes;
}

/// A decoder behind its guard, told that pictures have kWidth x kHeight.
class Decoder {
 public:
  Decoder() {
    guardJpegDecodersIn(pipeline_.get());
    source_ = add("appsrc");
    GstElement* decoder = add("jpegdec");
    g_object_set(decoder, "max-errors", -1, nullptr);  // pictures that can't be read are passed over
    sink_ = add("appsink");
    const CapsHandle format(gst_caps_new_simple("image/jpeg", "width", G_TYPE_INT, kWidth, "height",
                                                G_TYPE_INT, kHeight, "framerate", GST_TYPE_FRACTION, 25, 1,
                                                nullptr));
    g_object_set(source_, "caps", format.get(), "format", GST_FORMAT_TIME, nullptr);
    g_object_set(sink_, "sync", FALSE, nullptr);
    EXPECT_TRUE(gst_element_link_many(source_, decoder, sink_, nullptr));
    gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING);
  }
  ~Decoder() { gst_element_set_state(pipeline_.get(), GST_STATE_NULL); }
  Decoder(const Decoder&) = delete;
  Decoder& operator=(const Decoder&) = delete;

  void push(const Bytes& picture) {
    GstBuffer* buffer = gst_buffer_new_allocate(nullptr, picture.size(), nullptr);
    gst_buffer_fill(buffer, 0, picture.data(), picture.size());
    GST_BUFFER_PTS(buffer) = number_++ * 40 * GST_MSECOND;
    gst_app_src_push_buffer(GST_APP_SRC(source_), buffer);
  }
  /// The heights of everything that has come out, once all pictures are through.
  std::vector<int> heights() {
    gst_app_src_end_of_stream(GST_APP_SRC(source_));
    std::vector<int> all;
    while (const SampleHandle sample = pulled(sink_)) {
      int height = 0;
      gst_structure_get_int(gst_caps_get_structure(gst_sample_get_caps(sample.get()), 0), "height", &height);
      all.push_back(height);
    }
    return all;
  }

 private:
  GstElement* add(const char* name) {
    GstElement* element = gst_element_factory_make(name, nullptr);
    gst_bin_add(GST_BIN(pipeline_.get()), element);
    return element;
  }

  static GstHandle<GstElement> emptyPipeline() {
    ensureGStreamer();
    return GstHandle<GstElement>(GST_ELEMENT(gst_object_ref_sink(gst_pipeline_new(nullptr))));
  }

  GstHandle<GstElement> pipeline_ = emptyPipeline();
  GstElement* source_ = nullptr;
  GstElement* sink_ = nullptr;
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

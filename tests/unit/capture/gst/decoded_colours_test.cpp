// What real decoders say about the colours of their pictures, and that it is understood.
#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gtest/gtest.h>

#include "capture/gst/picture_converter.h"
#include "capture/gst/stream_colours.h"
#include "tests/unit/capture/gst/colour_bars.h"

namespace lmx {
namespace {

using testing::barsPicture;
using testing::distanceFromBars;
using testing::RawPicture;
using testing::recordedBars;

/// Sends a picture through elements. @return what comes out; null when nothing does
SampleHandle sentThrough(const RawPicture& picture, const std::string& elements) {
  auto pipeline = newPipeline("appsrc name=in format=time ! " + elements + " ! appsink name=out sync=false");
  if (!pipeline) {
    ADD_FAILURE() << pipeline.error().message;
    return nullptr;
  }
  const GstHandle<GstElement> in = elementNamed(pipeline->get(), "in");
  const GstHandle<GstElement> out = elementNamed(pipeline->get(), "out");
  if (const GstHandle<GstElement> camera = elementNamed(pipeline->get(), "camera")) {
    const GstHandle<GstPad> pad(gst_element_get_static_pad(camera.get(), "src"));
    correctColours(pad.get());
  }
  gst_app_src_set_caps(GST_APP_SRC(in.get()), picture.caps.get());
  gst_element_set_state(pipeline->get(), GST_STATE_PLAYING);
  for (int i = 0; i < 3; ++i) {
    GstBuffer* buffer = gst_buffer_copy(picture.buffer.get());
    GST_BUFFER_PTS(buffer) = i * GST_SECOND / 30;
    gst_app_src_push_buffer(GST_APP_SRC(in.get()), buffer);
  }
  gst_app_src_end_of_stream(GST_APP_SRC(in.get()));
  SampleHandle sample(gst_app_sink_try_pull_sample(GST_APP_SINK(out.get()), 20 * GST_SECOND));
  gst_element_set_state(pipeline->get(), GST_STATE_NULL);
  return sample;
}

struct Way {
  const char* name;
  const char* caps;
  double red, blue;
  bool full;
  const char* elements;
};

class DecodedColours : public ::testing::TestWithParam<Way> {};

TEST_P(DecodedColours, AreThoseOfTheCamera) {
  const Way& way = GetParam();
  for (const PictureSize size : {PictureSize{640, 360}, PictureSize{1280, 720}}) {
    const RawPicture picture = barsPicture("video/x-raw,framerate=30/1,width=" + std::to_string(size.width) +
                                               ",height=" + std::to_string(size.height) + "," + way.caps,
                                           way.red, way.blue, way.full);
    const SampleHandle sample = sentThrough(picture, way.elements);
    ASSERT_TRUE(sample);
    PictureConverter converter(size);
    const BufferHandle result =
        converter.convert(gst_sample_get_buffer(sample.get()), gst_sample_get_caps(sample.get()));
    ASSERT_TRUE(result);
    EXPECT_LE(distanceFromBars(recordedBars(result.get(), size)), 3)
        << GText(gst_caps_to_string(gst_sample_get_caps(sample.get()))).get();
  }
}

#define JPEG_ENCODER "jpegenc quality=100"
#define H264_ENCODER "x264enc pass=quant quantizer=4 tune=zerolatency speed-preset=ultrafast"

INSTANTIATE_TEST_SUITE_P(
    Table, DecodedColours,
    ::testing::Values(
        Way{"JPEG420", "format=I420,colorimetry=(string)1:4:0:0", 0.299, 0.114, true,
            JPEG_ENCODER " ! jpegdec"},
        Way{"JPEG422", "format=Y42B,colorimetry=(string)1:4:0:0", 0.299, 0.114, true,
            JPEG_ENCODER " ! jpegdec"},
        // As Video4Linux describes the JPEG of a webcam.
        Way{"JPEGOfAWebcam", "format=I420,colorimetry=(string)1:4:0:0", 0.299, 0.114, true,
            JPEG_ENCODER " ! capssetter caps=image/jpeg,colorimetry=(string)2:4:7:1 ! jpegdec"},
        Way{"JPEGOfAWebcamInAnotherDecoder", "format=I420,colorimetry=(string)1:4:0:0", 0.299, 0.114, true,
            JPEG_ENCODER " ! capssetter name=camera caps=image/jpeg,parsed=true,colorimetry=(string)2:4:7:1 "
                         "! avdec_mjpeg"},
        Way{"H264InAContainerWithoutRange", "format=I420,colorimetry=(string)1:3:5:1", 0.2126, 0.0722, true,
            H264_ENCODER
            " ! capssetter name=camera caps=video/x-h264,colorimetry=(string)bt709 ! h264parse ! "
            "avdec_h264"},
        Way{"H264Of709", "format=I420,colorimetry=(string)bt709", 0.2126, 0.0722, false,
            H264_ENCODER " ! h264parse ! avdec_h264"},
        Way{"H264Of601", "format=I420,colorimetry=(string)bt601", 0.299, 0.114, false,
            H264_ENCODER " ! h264parse ! avdec_h264"},
        Way{"H264Of709Full", "format=I420,colorimetry=(string)1:3:5:1", 0.2126, 0.0722, true,
            H264_ENCODER " ! h264parse ! avdec_h264"},
        Way{"H264Of601Full", "format=I420,colorimetry=(string)1:4:0:0", 0.299, 0.114, true,
            H264_ENCODER " ! h264parse ! avdec_h264"},
        Way{"H264Of444", "format=Y444,colorimetry=(string)bt709", 0.2126, 0.0722, false,
            H264_ENCODER " ! h264parse ! avdec_h264"}),
    [](const auto& way) { return std::string(way.param.name); });

}  // namespace
}  // namespace lmx

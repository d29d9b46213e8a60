#include "tests/unit/capture/gst/colour_bars.h"

#include <gst/video/video.h>

#include <algorithm>
#include <cmath>

namespace lmx::testing {
namespace {

using Components = std::array<double, 4>;  // 0…1: R, G, B or Y', Cb, Cr, then alpha

Components componentsOf(const RGB& colour, const GstVideoFormatInfo* format, double redWeight,
                        double blueWeight, bool full) {
  const double r = colour[0] / 255;
  const double g = colour[1] / 255;
  const double b = colour[2] / 255;
  if (GST_VIDEO_FORMAT_INFO_IS_RGB(format)) {
    const auto scaled = [full](double c) { return full ? c : (16 + 219 * c) / 255; };
    return {scaled(r), scaled(g), scaled(b), 1};
  }
  const double y = redWeight * r + (1 - redWeight - blueWeight) * g + blueWeight * b;
  const double cb = (b - y) / 2 / (1 - blueWeight);
  const double cr = (r - y) / 2 / (1 - redWeight);
  if (full) return {y, cb + 128.0 / 255, cr + 128.0 / 255, 1};
  return {(16 + 219 * y) / 255, (128 + 224 * cb) / 255, (128 + 224 * cr) / 255, 1};
}

const RGB& colourAt(int x, int y, int width, int height) {
  const int column = std::min(7, x * 8 / width);
  return barColours()[static_cast<std::size_t>(column + (y * 2 < height ? 0 : 8))];
}

void put(GstVideoFrame* frame, guint component, int x, int y, double value) {
  const GstVideoFormatInfo* format = frame->info.finfo;
  auto* at = static_cast<std::uint8_t*>(GST_VIDEO_FRAME_COMP_DATA(frame, component)) +
             y * GST_VIDEO_FRAME_COMP_STRIDE(frame, component) +
             x * GST_VIDEO_FRAME_COMP_PSTRIDE(frame, component);
  const unsigned depth = GST_VIDEO_FORMAT_INFO_DEPTH(format, component);
  if (depth == 8) {
    *at = static_cast<std::uint8_t>(std::lround(std::clamp(value, 0.0, 1.0) * 255));
    return;
  }
  // GStreamer 1.22 counts the second of two interleaved samples as one byte behind the first.
  if (GST_VIDEO_FORMAT_INFO_POFFSET(format, component) % 2 != 0) ++at;
  // More bits are the same number with more digits: 255 becomes 1020 in ten bits.
  const auto wide = static_cast<unsigned>(std::lround(std::clamp(value, 0.0, 1.0) * 255 * (1 << (depth - 8))))
                    << GST_VIDEO_FORMAT_INFO_SHIFT(format, component);
  at[0] = static_cast<std::uint8_t>(wide & 255U);
  at[1] = static_cast<std::uint8_t>(wide >> 8U);
}

RGB decoded(double y, double cb, double cr) {
  const double luma = (y - 16) / 219;
  const double r = luma + (cr - 128) / 224 * 2 * (1 - 0.2126);
  const double b = luma + (cb - 128) / 224 * 2 * (1 - 0.0722);
  const double g = (luma - 0.2126 * r - 0.0722 * b) / (1 - 0.2126 - 0.0722);
  return {255 * r, 255 * g, 255 * b};
}

}  // namespace

const std::vector<RGB>& barColours() {
  static const std::vector<RGB> kColours = {
      {191, 191, 191}, {191, 191, 0},   {0, 191, 191},   {0, 191, 0},    {191, 0, 191}, {191, 0, 0},
      {0, 0, 191},     {20, 200, 90},   {0, 0, 0},       {16, 16, 16},   {17, 17, 17},  {64, 64, 64},
      {128, 128, 128}, {200, 200, 200}, {238, 238, 238}, {255, 255, 255}};
  return kColours;
}

RawPicture barsPicture(const std::string& caps, double redWeight, double blueWeight, bool full) {
  ensureGStreamer();
  RawPicture picture{CapsHandle(gst_caps_from_string(caps.c_str())), nullptr};
  GstVideoInfo info;
  if (!picture.caps || gst_video_info_from_caps(&info, picture.caps.get()) == FALSE) return picture;
  picture.buffer.reset(gst_buffer_new_allocate(nullptr, info.size, nullptr));
  GST_BUFFER_PTS(picture.buffer.get()) = 5 * GST_SECOND;
  GstVideoFrame frame;
  gst_video_frame_map(&frame, &info, picture.buffer.get(), GST_MAP_WRITE);
  for (guint c = 0; c < GST_VIDEO_FORMAT_INFO_N_COMPONENTS(info.finfo); ++c) {
    const int width = GST_VIDEO_FRAME_COMP_WIDTH(&frame, c);
    const int height = GST_VIDEO_FRAME_COMP_HEIGHT(&frame, c);
    for (int y = 0; y < height; ++y) {
      for (int x = 0; x < width; ++x)
        put(&frame, c, x, y,
            componentsOf(colourAt(x, y, width, height), info.finfo, redWeight, blueWeight, full)[c]);
    }
  }
  gst_video_frame_unmap(&frame);
  return picture;
}

std::vector<RGB> recordedBars(GstBuffer* buffer, PictureSize size, PictureSize part) {
  GstVideoInfo info;
  gst_video_info_set_format(&info, GST_VIDEO_FORMAT_I420, static_cast<guint>(size.width),
                            static_cast<guint>(size.height));
  GstVideoFrame frame;
  std::vector<RGB> colours;
  if (buffer == nullptr || gst_video_frame_map(&frame, &info, buffer, GST_MAP_READ) == FALSE) return colours;
  const auto at = [&](int plane, int x, int y) {
    return static_cast<double>(static_cast<const std::uint8_t*>(
        GST_VIDEO_FRAME_PLANE_DATA(&frame, plane))[y * GST_VIDEO_FRAME_PLANE_STRIDE(&frame, plane) + x]);
  };
  for (int row = 0; row < 2; ++row) {
    for (int column = 0; column < 8; ++column) {
      const int x = (size.width - part.width) / 2 + part.width * (2 * column + 1) / 16;
      const int y = (size.height - part.height) / 2 + part.height * (2 * row + 1) / 4;
      colours.push_back(decoded(at(0, x, y), at(1, x / 2, y / 2), at(2, x / 2, y / 2)));
    }
  }
  gst_video_frame_unmap(&frame);
  return colours;
}

double distanceFromBars(const std::vector<RGB>& colours) {
  if (colours.size() != barColours().size()) return 256;
  double distance = 0;
  for (std::size_t i = 0; i < colours.size(); ++i) {
    for (std::size_t c = 0; c < 3; ++c)
      distance = std::max(distance, std::abs(colours[i][c] - barColours()[i][c]));
  }
  return distance;
}

}  // namespace lmx::testing

// Reads sizes, rates and colours out of caps.
#include "capture/gst/picture_format.h"

#include <algorithm>
#include <cmath>

#include "support/format.h"

namespace lmx {
namespace {

constexpr int kLargestSD = 576;  // rows; above it an untold matrix of a stream is BT.709

const GstStructure* structureOf(const GstCaps* caps) {
  return caps == nullptr || gst_caps_is_any(caps) != FALSE || gst_caps_is_empty(caps) != FALSE
             ? nullptr
             : gst_caps_get_structure(caps, 0);
}

int number(const GstStructure* structure, const char* field) {
  int value = 0;
  return gst_structure_get_int(structure, field, &value) != FALSE ? value : 0;
}

double pixelAspect(const GstStructure* structure) {
  int numerator = 1;
  int denominator = 1;
  gst_structure_get_fraction(structure, "pixel-aspect-ratio", &numerator, &denominator);
  return numerator > 0 && denominator > 0 ? static_cast<double>(numerator) / denominator : 1;
}

/// A matrix that nobody stated. Cameras that hand out raw pictures use BT.601 whatever the size; streams
/// follow the television standards, and their decoders tell at least where the chroma samples lie.
GstVideoColorMatrix untoldMatrix(const GstStructure* structure, const GstVideoFormatInfo* format) {
  const bool fullChromaRows = GST_VIDEO_FORMAT_INFO_H_SUB(format, 1) == 0;
  const bool packed = GST_VIDEO_FORMAT_INFO_N_PLANES(format) == 1;
  const bool decoded = gst_structure_has_field(structure, "chroma-site") != FALSE ||
                       gst_structure_has_field(structure, "interlace-mode") != FALSE;
  if ((packed && fullChromaRows) || !decoded || number(structure, "height") <= kLargestSD)
    return GST_VIDEO_COLOR_MATRIX_BT601;
  return GST_VIDEO_COLOR_MATRIX_BT709;
}

}  // namespace

PictureSize recordedSize(const GstCaps* caps, PictureSize limit) {
  const GstStructure* structure = structureOf(caps);
  if (structure == nullptr) return limit;
  double width = number(structure, "width");
  double height = number(structure, "height");
  if (width <= 0 || height <= 0) return limit;
  // Pixels are only ever stretched, so that squaring them loses nothing.
  const double aspect = pixelAspect(structure);
  (aspect > 1 ? width : height) *= std::max(aspect, 1 / aspect);
  return fittedSize(width, height, limit);
}

std::optional<FrameRate> nominalRate(const GstCaps* caps) {
  const GstStructure* structure = structureOf(caps);
  int numerator = 0;
  int denominator = 1;
  if (structure == nullptr ||
      gst_structure_get_fraction(structure, "framerate", &numerator, &denominator) == FALSE ||
      numerator <= 0 || denominator <= 0)
    return std::nullopt;
  if (denominator == 1 || denominator == 1001) return FrameRate{numerator, denominator};
  const double rate = static_cast<double>(numerator) / denominator;
  const double whole = std::round(rate);
  if (whole >= 1 && std::abs(rate - whole) < 1e-3) return FrameRate{static_cast<int>(whole), 1};
  return rate < 1e-3 ? std::nullopt : std::optional(frameRateFrom(rate));
}

GstVideoColorimetry colorimetryOf(const GstCaps* caps, const GstVideoFormatInfo* format) {
  GstVideoColorimetry colours{GST_VIDEO_COLOR_RANGE_UNKNOWN, GST_VIDEO_COLOR_MATRIX_UNKNOWN,
                              GST_VIDEO_TRANSFER_UNKNOWN, GST_VIDEO_COLOR_PRIMARIES_UNKNOWN};
  const GstStructure* structure = structureOf(caps);
  if (structure == nullptr) return colours;
  const char* stated = gst_structure_get_string(structure, "colorimetry");
  if (stated != nullptr) gst_video_colorimetry_from_string(&colours, stated);
  const bool rgb = GST_VIDEO_FORMAT_INFO_IS_RGB(format);
  if (colours.range == GST_VIDEO_COLOR_RANGE_UNKNOWN) {
    // Grey pictures come from infrared and industrial cameras, which use all of the range.
    const bool full = rgb || GST_VIDEO_FORMAT_INFO_IS_GRAY(format);
    colours.range = full ? GST_VIDEO_COLOR_RANGE_0_255 : GST_VIDEO_COLOR_RANGE_16_235;
  }
  if (rgb) {
    colours.matrix = GST_VIDEO_COLOR_MATRIX_RGB;
  } else if (colours.matrix == GST_VIDEO_COLOR_MATRIX_RGB) {
    // Drivers state "sRGB" for what they have converted to Y'CbCr the old way.
    colours.matrix = GST_VIDEO_COLOR_MATRIX_BT601;
  } else if (colours.matrix == GST_VIDEO_COLOR_MATRIX_UNKNOWN) {
    colours.matrix = untoldMatrix(structure, format);
  }
  return colours;
}

std::string formatText(const GstCaps* caps) {
  const GstStructure* structure = structureOf(caps);
  if (structure == nullptr) return "unknown";
  const char* format = gst_structure_get_string(structure, "format");
  const auto rate = nominalRate(caps);
  return string_with_format("%dx%d", number(structure, "width"), number(structure, "height")) +
         (format == nullptr ? "" : std::string(" ") + format) +
         (rate ? string_with_format(" at %.5g fps", 1 / rate->frameSeconds()) : "");
}

}  // namespace lmx

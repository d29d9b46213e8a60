// What the caps of raw pictures mean for a recording: size, rate, colours. Pure.
#pragma once
#include <gst/video/video.h>

#include <optional>
#include <string>

#include "capture/api/picture.h"

namespace lmx {

/// Size in which pictures of that format are recorded: square pixels, no larger than `limit` with the aspect
/// ratio kept, even numbers, at least 16. `limit` itself when the caps tell no size.
PictureSize recordedSize(const GstCaps* caps, PictureSize limit = kFullHD);

/// Nominal frame rate of the caps; nothing when it is variable or unknown. Rates that a driver gives in
/// 100 ns units are the round ones they stand for.
std::optional<FrameRate> nominalRate(const GstCaps* caps);

/// The colours of raw pictures: what the caps state, completed by what devices and decoders mean that state
/// nothing. Matrix and range are always known afterwards.
GstVideoColorimetry colorimetryOf(const GstCaps* caps, const GstVideoFormatInfo* format);

/// The format in words: "1280x720 YUY2 at 30 fps".
std::string formatText(const GstCaps* caps);

}  // namespace lmx

// Whether GStreamer's JPEG decoder may be given a picture.
#pragma once
#include <cstdint>
#include <span>

namespace lmx {

/// @param picture  a whole JPEG picture, or the two fields of one, one behind the other
/// @param width, height  what has been stated to the decoder (jpegdec), pixels; 0 when nothing has
/// @return false when the decoder would write beside its memory, take more than there is, give up the stream
///     or could not read the picture's headers. Whether the picture within is any good is the decoder's
///     business. Pure.
bool harmlessJpegPicture(std::span<const std::uint8_t> picture, int width, int height);

}  // namespace lmx

// Pictures of known colours in any raw format, and the colours of a recorded picture.
#pragma once
#include <array>
#include <string>
#include <vector>

#include "capture/api/picture.h"
#include "capture/gst/gst_handles.h"

namespace lmx::testing {

using RGB = std::array<double, 3>;  ///< 0…255

/// White to black in eight bars, then eight greys below them, left to right.
const std::vector<RGB>& barColours();

struct RawPicture {
  CapsHandle caps;
  BufferHandle buffer;
};
/// Bars in the upper half, greys in the lower half. Computed here, not by GStreamer.
/// @param caps  fixed raw caps
/// @param redWeight, blueWeight, full  what the numbers of the picture mean (not read from the caps)
RawPicture barsPicture(const std::string& caps, double redWeight, double blueWeight, bool full);

/// The sixteen colours in the part of an I420 picture of that size, read as BT.709 in limited range.
std::vector<RGB> recordedBars(GstBuffer* buffer, PictureSize size, PictureSize part);
inline std::vector<RGB> recordedBars(GstBuffer* buffer, PictureSize size) {
  return recordedBars(buffer, size, size);
}

/// The greatest difference between a component of `colours` and of the bars; 256 when the counts differ.
double distanceFromBars(const std::vector<RGB>& colours);

}  // namespace lmx::testing

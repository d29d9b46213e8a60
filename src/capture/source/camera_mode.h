// The modes that a camera offers, and the choice among them. Pure.
#pragma once
#include <gst/gst.h>

#include <optional>
#include <string>
#include <vector>

#include "capture/api/picture.h"
#include "capture/gst/gst_handles.h"

namespace lmx {

/// How a camera hands out its pictures; in the order in which they are preferred.
enum class CameraCoding { raw, jpeg, h264 };

/// A way in which a camera works: one size and rate, or a range of them.
struct CameraMode {
  CameraCoding coding = CameraCoding::raw;
  std::string format;  ///< of raw pictures, such as "YUY2"; empty when the camera doesn't tell
  bool interlaced = false;
  PictureSize size;         ///< the largest of the range
  PictureSize smallest;     ///< the same as `size` when there is no range
  PictureSize step{1, 1};   ///< between the sizes of the range
  FrameRate rate{0, 1};     ///< the highest of the range, as the camera writes it; 0/1 when unknown
  FrameRate slowest{0, 1};  ///< the same as `rate` when there is no range
};

/// What is wanted of a camera.
struct CameraDemand {
  PictureSize size = kFullHD;  ///< the largest picture that is of use
  double maximumRate = 30;     ///< frames a second
  bool decodesJPEG = true;     ///< whether the machine can
  bool decodesH264 = true;
};

/// All modes in the caps of a device: raw, JPEG and H.264 pictures in ordinary memory.
std::vector<CameraMode> offeredModes(const GstCaps* caps);

/// The mode with which a camera is opened; with one size and one rate. In this order:
/// - colour before grey;
/// - a picture as large and as fluent as wanted, or as much of both as there is: what counts is pixels of the
///   wanted shape a second, no more than a film has frames, and less than 10 only if there is nothing else;
/// - the smallest size, and without interlacing;
/// - a rate at or below the maximum;
/// - raw before JPEG before H.264, and among raw formats the one that is converted with least effort;
/// - the rate nearest to the maximum.
/// @return nothing when no mode can be used
std::optional<CameraMode> chooseMode(const std::vector<CameraMode>& modes, const CameraDemand& demand);

/// Caps for a filter behind the camera's element.
CapsHandle capsOf(const CameraMode& mode);

/// The mode in words: "1920x1080 at 30 fps, JPEG".
std::string describe(const CameraMode& mode);

/// Why `chosen` is the choice among `modes`, in words for the device list.
std::string reasonFor(const CameraMode& chosen, const std::vector<CameraMode>& modes,
                      const CameraDemand& demand);

}  // namespace lmx

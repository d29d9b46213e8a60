#pragma once
#include <optional>
#include <string>
#include <vector>

#include "capture/api/picture.h"
#include "capture/gst/gst_handles.h"
namespace lmx {
struct CameraDemand {
  PictureSize greatest{1920, 1080};
  FrameRate rate;
};
struct CameraMode {};
std::vector<CameraMode> offeredModes(const GstCaps* caps);
std::optional<CameraMode> chooseMode(const std::vector<CameraMode>& modes, const CameraDemand& demand);
CapsHandle capsOf(const CameraMode& mode);
std::string describe(const CameraMode& mode);
}  // namespace lmx

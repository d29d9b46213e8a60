#include "capture/source/camera_mode.h"
namespace lmx {
std::vector<CameraMode> offeredModes(const GstCaps* /*caps*/) { return {}; }
std::optional<CameraMode> chooseMode(const std::vector<CameraMode>& /*modes*/, const CameraDemand& /*demand*/) { return std::nullopt; }
CapsHandle capsOf(const CameraMode& /*mode*/) { return nullptr; }
std::string describe(const CameraMode& /*mode*/) { return {}; }
}  // namespace lmx

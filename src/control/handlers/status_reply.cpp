// The texts of the STATUS reply.
#include "control/handlers/status_reply.h"

#include "control/protocol/reply.h"
#include "support/format.h"

namespace lmx {

std::string statusFields(int cmdStatus, const RecordStatus& status) {
  const std::string fields = string_with_format(
      ",recordStatus=%i,start=%i,elapsedTime=%lld,stop=%i,hard_stop=%i,lastError=%i,availDiskInMB=%.0f,"
      "totalDiskInMB=%.0f",
      status.recordStatus, status.start, static_cast<long long>(status.elapsedSeconds), status.stop,
      status.hardStop, status.lastError, status.availableDiskMB, status.totalDiskMB);
  return fields.empty() ? fields : replyText(cmdStatus) + fields;
}

std::string profileFields(const std::optional<std::string>& camera,
                          const std::optional<std::string>& tunnel_host,
                          const std::optional<std::string>& capture_preset) {
  return "CameraName=" + camera.value_or("") + ",TunnelHost=" + tunnel_host.value_or("") +
         ",RecordingCapturePreset=" + capture_preset.value_or("");
}

std::string previewFields(const AudioLevels& levels, const std::string& base64) {
  return string_with_format("audio-level-left=%f,audio-level-right=%f,preview-size=%d,preview=",
                            static_cast<double>(levels.left), static_cast<double>(levels.right),
                            static_cast<int>(base64.size())) +
         base64;
}

}  // namespace lmx

// The texts of the STATUS reply.
#pragma once
#include <optional>
#include <string>

#include "control/protocol/audio_levels.h"
#include "record/recording_status.h"

namespace lmx {

/// "cmdStatus=…,recordStatus=…" and the other fields that every status has; empty only when it can't be
/// formatted.
std::string statusFields(int cmdStatus, const RecordStatus& status);

/// "CameraName=…,TunnelHost=…,RecordingCapturePreset=…"; what is not set reads empty.
std::string profileFields(const std::optional<std::string>& camera,
                          const std::optional<std::string>& tunnel_host,
                          const std::optional<std::string>& capture_preset);

/// "audio-level-left=…,audio-level-right=…,preview-size=…,preview=…". @param base64  the JPEG image
std::string previewFields(const AudioLevels& levels, const std::string& base64);

}  // namespace lmx

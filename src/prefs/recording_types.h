// The names of the recording types in preferences and properties documents.
#pragma once
#include <optional>
#include <string>
#include <string_view>

#include "capture/api/capture_settings.h"
#include "model/codes.h"

namespace lmx {

/// The name of a type; null for an unknown code.
const char* recTypeToString(int code);
/// The code for a name; kRecordingTypeNone for an unknown or absent one.
RecordingTypeCode recTypeToCode(const std::optional<std::string>& name);
/// The capture framework's number for a name; audio and video for an unknown one.
CaptureType captureTypeFromString(std::string_view name);

}  // namespace lmx

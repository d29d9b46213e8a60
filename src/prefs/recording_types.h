// The names of the recording types, as preferences and documents spell them.
#pragma once
#include <optional>
#include <string>
#include <string_view>

#include "capture/api/capture_settings.h"
#include "model/codes.h"

namespace lmx {

/// The name of a type; null for a code that has none.
const char* recTypeToString(int code);
/// The code of a name; kRecordingTypeNone for an unknown or absent one.
RecordingTypeCode recTypeToCode(const std::optional<std::string>& name);
/// The capture framework's number for a name; picture and sound for an unknown one.
CaptureType captureTypeFromString(std::string_view name);

}  // namespace lmx

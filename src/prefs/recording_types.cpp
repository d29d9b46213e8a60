// The table of recording types, with names and numbers.
#include "prefs/recording_types.h"

namespace lmx {
namespace {

struct RecordingTypeName {
  const char* name;
  RecordingTypeCode code;
  CaptureType captureType;
};
constexpr RecordingTypeName kTypes[] = {{"Audio", kRecordingTypeAudio, CaptureType::audio},
                                        {"Audio+Video", kRecordingTypeAudioVideo, CaptureType::audioAndVideo},
                                        {"File", kRecordingTypeFile, CaptureType::file},
                                        {"Video", kRecordingTypeVideo, CaptureType::video}};

const RecordingTypeName* find(std::string_view name) {
  for (const RecordingTypeName& type : kTypes) {
    if (name == type.name) return &type;
  }
  return nullptr;
}

}  // namespace

const char* recTypeToString(int code) {
  for (const RecordingTypeName& type : kTypes) {
    if (type.code == code) return type.name;
  }
  return nullptr;
}

RecordingTypeCode recTypeToCode(const std::optional<std::string>& name) {
  const RecordingTypeName* type = name ? find(*name) : nullptr;
  return type == nullptr ? kRecordingTypeNone : type->code;
}

CaptureType captureTypeFromString(std::string_view name) {
  const RecordingTypeName* type = find(name);
  return type == nullptr ? CaptureType::audioAndVideo : type->captureType;
}

}  // namespace lmx

// Building and validating the settings of a capture.
#include <cstdio>
#include <cstdlib>
#include <iterator>

#include "platform/identifiers.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "prefs/agent_preferences.h"
#include "prefs/continuous_settings.h"

namespace lmx {
namespace {

struct RecordingTypeName {
  const char* name;
  int code;
  CaptureType captureType;
};
constexpr RecordingTypeName kTypes[] = {{"Audio", 1, CaptureType::audio},
                                        {"Audio+Video", 2, CaptureType::audioAndVideo},
                                        {"File", 4, CaptureType::file},
                                        {"Video", 3, CaptureType::video}};

using Text = std::optional<std::string>;

Text textOf(const std::optional<PlistValue>& value) {
  if (!value || value->string() == nullptr) return std::nullopt;
  return *value->string();
}

RecordingQuality qualityOf(const Text& preset) {
  if (preset && preset->ends_with(":Good")) return RecordingQuality::good;
  if (preset && preset->ends_with(":Best")) return RecordingQuality::best;
  return RecordingQuality::better;
}

std::int64_t integerOf(const Text& text) { return text ? std::strtoll(text->c_str(), nullptr, 10) : 0; }

void enableMedia(LMRRecordingContext& context) {
  if (context.captureType == CaptureType::file) return;
  context.audioEnabled = context.captureType != CaptureType::video;
  context.videoEnabled = context.captureType != CaptureType::audio;
  context.previewEnabled = context.videoEnabled;
}

Text chooseVideoDevice(const Text& wanted, CaptureCatalog& catalog) {
  if (wanted != "Automatic") return wanted;
  const Text camera = catalog.defaultVideoDevice();
  return camera ? camera : catalog.defaultMuxedDevice();
}

Text chooseAudioDevice(const Text& wanted, const Text& videoDevice, CaptureCatalog& catalog) {
  if (wanted != "Automatic") return wanted;
  if (!videoDevice || !catalog.hasDevice(*videoDevice)) return std::nullopt;
  return catalog.preferredAudioDevice(*videoDevice).uniqueID;
}

}  // namespace

const char* AgentPreferences::recTypeToString(int code) {
  for (const RecordingTypeName& type : kTypes) {
    if (type.code == code) return type.name;
  }
  return nullptr;
}

int AgentPreferences::recTypeToCode(const char* name) {
  for (const RecordingTypeName& type : kTypes) {
    if (name != nullptr && std::string(type.name) == name) return type.code;
  }
  return 0;
}

PlistDictionary AgentPreferences::adHocDefaults() {
  return {{"RecordingType", "Audio+Video"},
          {"RecordingCapturePreset", "Video:Better"},
          {"RecordingCaptureDescription", "50% resolution H.264 Video, Stereo AAC VBR, 44 kHz sample rate"},
          {"RecordingDiskSpaceCutoffInMB", "1024"},
          {"RecordingAudioInput", "Automatic"},
          {"RecordingAudioChannel", "Stereo"},
          {"RecordingAudioSampleRate", "44"},
          {"RecordingVideoInput", "Automatic"},
          {"RecordingVideoMaximumFrameRate", "30"},
          {"RecordingVideoImagePercent", "50"},
          {"PreviewIntervalInMilliseconds", "400"}};
}

void AgentPreferences::failInvalidCompression(const std::string& key, const std::string& value) {
  resetPrefsCache();
  throw PreferenceError("Unknown compression type: \"" + value + "\" for preference: " + key);
}
void AgentPreferences::failInvalidDevice(const std::string& key, const std::string& value) {
  resetPrefsCache();
  throw PreferenceError("Unknown device ID: " + value + " for preference: " + key);
}
void AgentPreferences::failInvalidPreference(const std::string& key, const std::string& value) {
  resetPrefsCache();
  throw PreferenceError("Invalid value: " + value + " for preference: " + key);
}
void AgentPreferences::failPreferenceRequired(const std::string& key) {
  resetPrefsCache();
  throw PreferenceError("Missing required preference: " + key);
}

CaptureType AgentPreferences::captureTypeFromString(const std::string& name) const {
  for (const RecordingTypeName& type : kTypes) {
    if (name == type.name) return type.captureType;
  }
  return CaptureType::audioAndVideo;
}

CaptureType AgentPreferences::captureTypeFromPrefsWithSelector(Selector read) {
  const Text name = textOf((this->*read)("RecordingType"));
  if (!name) failPreferenceRequired("RecordingType");
  if (recTypeToCode(name->c_str()) == 0) failInvalidPreference("RecordingType", *name);
  resetPrefsCache();
  return captureTypeFromString(*name);
}

std::shared_ptr<LMRRecordingContext> AgentPreferences::newRecordingContextForAdHoc(
    std::shared_ptr<CaptureCatalog> catalog) {
  AgentPreferences prefs(std::move(catalog));
  const CaptureType type = prefs.captureTypeFromPrefsWithSelector(&AgentPreferences::get);
  return prefs.newRecordingContextWithSelector(&AgentPreferences::get, type);
}

std::shared_ptr<LMRRecordingContext> AgentPreferences::newRecordingContextForDaemon(
    std::shared_ptr<CaptureCatalog> catalog) {
  AgentPreferences prefs(std::move(catalog));
  prefs.migrateOldKeys();
  const CaptureType type = prefs.captureTypeFromPrefsWithSelector(&AgentPreferences::getFromPrefsFile);
  return prefs.newRecordingContextForDaemonWithRecordingType(type);
}

std::shared_ptr<LMRRecordingContext> AgentPreferences::newRecordingContextForDaemonWithRecordingType(
    CaptureType type) {
  return newRecordingContextWithSelector(&AgentPreferences::getFromPrefsFile, type);
}

std::shared_ptr<LMRRecordingContext> AgentPreferences::newRecordingContextWithSelector(Selector read,
                                                                                       CaptureType type) {
  const auto text = [this, read](const char* key) { return textOf((this->*read)(key)); };
  auto context = std::make_shared<LMRRecordingContext>();
  const Text preset = text("RecordingCapturePreset");
  context->uuid = newUUIDString();
  context->captureType = type;
  enableMedia(*context);
  if (context->videoEnabled) {
    context->videoDeviceID = chooseVideoDevice(text("RecordingVideoInput"), *catalog_);
    context->videoCompressionOptions = catalog_->compressionOptions(MediaType::video, qualityOf(preset));
    if (!context->videoCompressionOptions)
      failInvalidCompression("RecordingCapturePreset", preset.value_or(""));
  }
  if (context->audioEnabled) {
    context->audioDeviceID =
        chooseAudioDevice(text("RecordingAudioInput"), context->videoDeviceID, *catalog_);
    if (!catalog_->audioDeviceUsable(context->audioDeviceID)) {
      failInvalidDevice("RecordingAudioInput", context->audioDeviceID.value_or(""));
    }
    context->audioCompressionOptions = catalog_->compressionOptions(MediaType::audio, qualityOf(preset));
    if (!context->audioCompressionOptions)
      failInvalidCompression("RecordingCapturePreset", preset.value_or(""));
  }
  const Text repository = text("RecordingRepositoryPath");
  if (!repository) failPreferenceRequired("RecordingRepositoryPath");
  context->captureTempDir = *repository;
  context->diskSpaceCutoffInMB = integerOf(text("RecordingDiskSpaceCutoffInMB"));
  context->previewIntervalInMilliseconds = integerOf(text("PreviewIntervalInMilliseconds"));
  context->previewImagePath = systemPath(kPreviewImage);
  const auto continuous = (this->*read)("ContinuousRecording");
  if (continuous && continuous->dictionary() != nullptr) {
    context->continuous = continuousInfoFrom(*continuous->dictionary());
    if (!continuousInfoValid(context->continuous)) return nullptr;
  }
  resetPrefsCache();
  return context;
}

void AgentPreferences::dumpDaemon() {
  AgentPreferences().dumpWithSelector(&AgentPreferences::getFromPrefsFile);
}
void AgentPreferences::dumpAdHoc() { AgentPreferences().dumpWithSelector(&AgentPreferences::get); }

void AgentPreferences::dumpWithSelector(Selector read) {
  static constexpr const char* kKeys[] = {"RecordingType",
                                          "RecordingVideoInput",
                                          "RecordingVideoMaximumFrameRate",
                                          "RecordingAudioChannel",
                                          "RecordingAudioInput",
                                          "RecordingAudioSampleRate",
                                          "CameraName",
                                          "CameraUUID",
                                          "RecordingRepositoryPath",
                                          "RecordingDiskSpaceCutoffInMB",
                                          "PreviewIntervalInMilliseconds",
                                          "ServerUUID",
                                          "TunnelHost",
                                          "TunnelPort",
                                          "LumexURL"};
  for (const char* key : kKeys) {
    if (const Text value = textOf((this->*read)(key))) std::printf("'%s' == '%s'\n", key, value->c_str());
  }
}

}  // namespace lmx

// Chooses devices and compressions, and validates the preferences.
#include "prefs/recording_context.h"

#include <cstdlib>

#include "platform/identifiers.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "prefs/continuous_settings.h"
#include "prefs/recording_types.h"
#include "prefs/signal_settings.h"
#include "support/format.h"
#include "support/redacted.h"

namespace lmx {
namespace {

using Text = std::optional<std::string>;

RecordingQuality qualityOf(const Text& preset) {
  if (preset && preset->ends_with(":Good")) return RecordingQuality::good;
  if (preset && preset->ends_with(":Best")) return RecordingQuality::best;
  return RecordingQuality::better;
}

PictureSize maximumSizeFrom(const Text& text) {
  if (!text || text->empty()) return kFullHD;
  const auto size = pictureSizeFrom(*text);
  if (!size) {
    LMPLogMessage(nullptr, kLogError,
                  "\"RecordingVideoMaximumSize\" is \"%s\", which is no size from 64x64 to 1920x1080: "
                  "1920x1080 is taken",
                  text->c_str());
  }
  return size.value_or(kFullHD);
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

void RecordingContextBuilder::fail(const std::string& reason) {
  prefs_.resetPrefsCache();
  throw PreferenceError(redacted(reason));
}
void RecordingContextBuilder::failInvalidCompression(const std::string& key, const std::string& value) {
  fail("Unknown compression type: \"" + value + "\" for preference: " + key);
}
void RecordingContextBuilder::failInvalidDevice(const std::string& key, const std::string& value) {
  fail("Unknown device ID: " + value + " for preference: " + key);
}
void RecordingContextBuilder::failInvalidPreference(const std::string& key, const std::string& value) {
  fail("Invalid value: " + value + " for preference: " + key);
}
void RecordingContextBuilder::failPreferenceRequired(const std::string& key) {
  fail("Missing required preference: " + key);
}

CaptureType RecordingContextBuilder::captureTypeFromPrefs() {
  const Text name = text("RecordingType");
  if (!name) failPreferenceRequired("RecordingType");
  if (recTypeToCode(name) == kRecordingTypeNone) failInvalidPreference("RecordingType", *name);
  prefs_.resetPrefsCache();
  return captureTypeFromString(*name);
}

std::shared_ptr<LMRRecordingContext> RecordingContextBuilder::newRecordingContext(CaptureType type) {
  auto context = std::make_shared<LMRRecordingContext>();
  const Text preset = text("RecordingCapturePreset");
  context->uuid = newUUIDString();
  context->captureType = type;
  enableMedia(*context);
  if (context->videoEnabled) chooseVideo(*context, preset);
  if (context->audioEnabled) chooseAudio(*context, preset);
  const Text repository = text("RecordingRepositoryPath");
  if (!repository) failPreferenceRequired("RecordingRepositoryPath");
  context->captureTempDir = *repository;
  context->diskSpaceCutoffInMB = integerOf(text("RecordingDiskSpaceCutoffInMB"));
  context->previewIntervalInMilliseconds = integerOf(text("PreviewIntervalInMilliseconds"));
  context->signal = signalThresholds([this](const char* key) { return text(key); });
  context->previewImagePath = systemPath(kPreviewImage);
  const auto continuous = (prefs_.*read_)("ContinuousRecording");
  if (continuous && continuous->dictionary() != nullptr) {
    context->continuous = continuousInfoFrom(*continuous->dictionary());
    if (!continuousInfoValid(context->continuous)) return nullptr;
  }
  prefs_.resetPrefsCache();
  return context;
}

void RecordingContextBuilder::chooseVideo(LMRRecordingContext& context, const Text& preset) {
  context.videoDeviceID = chooseVideoDevice(text("RecordingVideoInput"), catalog_);
  context.maximumSize = maximumSizeFrom(text("RecordingVideoMaximumSize"));
  context.videoCompressionOptions = catalog_.compressionOptions(MediaType::video, qualityOf(preset));
  if (!context.videoCompressionOptions) failInvalidCompression("RecordingCapturePreset", textOrNull(preset));
}

void RecordingContextBuilder::chooseAudio(LMRRecordingContext& context, const Text& preset) {
  context.audioDeviceID = chooseAudioDevice(text("RecordingAudioInput"), context.videoDeviceID, catalog_);
  // A microphone that is away is no reason to refuse: the picture is still a lecture, and it may come back.
  if (context.audioDeviceID && !catalog_.canBeMicrophone(*context.audioDeviceID)) {
    failInvalidDevice("RecordingAudioInput", *context.audioDeviceID);
  }
  context.audioCompressionOptions = catalog_.compressionOptions(MediaType::audio, qualityOf(preset));
  if (!context.audioCompressionOptions) failInvalidCompression("RecordingCapturePreset", textOrNull(preset));
}

double maximumFrameRateFrom(const std::optional<std::string>& text) {
  const double rate = text ? std::strtod(text->c_str(), nullptr) : 0;
  return rate >= 1 && rate <= 240 ? rate : 30.0;
}

PictureLimits pictureLimitsInPrefs() {
  AgentPreferences prefs;
  const auto read = [&prefs](const char* key) { return textOf(prefs.getFromPrefsFile(key)); };
  return {.size = maximumSizeFrom(read("RecordingVideoMaximumSize")),
          .rate = maximumFrameRateFrom(read("RecordingVideoMaximumFrameRate"))};
}

std::shared_ptr<LMRRecordingContext> newRecordingContextForAdHoc(CaptureCatalog& catalog) {
  AgentPreferences prefs;
  RecordingContextBuilder builder(prefs, &AgentPreferences::get, catalog);
  return builder.newRecordingContext(builder.captureTypeFromPrefs());
}

std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemon(CaptureCatalog& catalog) {
  AgentPreferences prefs;
  prefs.migrateOldKeys();
  RecordingContextBuilder builder(prefs, &AgentPreferences::getFromPrefsFile, catalog);
  return builder.newRecordingContext(builder.captureTypeFromPrefs());
}

std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemonWithRecordingType(CaptureCatalog& catalog,
                                                                                   CaptureType type) {
  AgentPreferences prefs;
  return RecordingContextBuilder(prefs, &AgentPreferences::getFromPrefsFile, catalog)
      .newRecordingContext(type);
}

}  // namespace lmx

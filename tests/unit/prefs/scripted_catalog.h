// A scripted catalog of devices and compressions.
#pragma once
#include <map>
#include <optional>
#include <set>
#include <string>

#include "capture/api/capture_settings.h"

namespace lmx::testing {

/// A machine with a camera and its microphone, unless the test changes that.
class ScriptedCatalog : public CaptureCatalog {
 public:
  std::optional<std::string> camera = "camera";
  std::optional<std::string> muxed;
  std::set<std::string> devices{"camera"};
  std::map<std::string, std::string> microphone_of{{"camera", "microphone"}};
  std::set<std::string> malformed;  ///< what can't be a microphone's identifier
  std::set<MediaType> compressible{MediaType::audio, MediaType::video};

  std::optional<std::string> defaultVideoDevice() override { return camera; }
  std::optional<std::string> defaultMuxedDevice() override { return muxed; }
  bool hasDevice(const std::string& uniqueID) override { return devices.contains(uniqueID); }
  PreferredAudio preferredAudioDevice(const std::string& videoDevice) override {
    const auto found = microphone_of.find(videoDevice);
    if (found == microphone_of.end()) return {};
    return {found->second, found->second == videoDevice};
  }
  bool canBeMicrophone(const std::string& audioDevice) override { return !malformed.contains(audioDevice); }
  bool hasMicrophone(const std::optional<std::string>&) override { return true; }
  std::optional<LMRCompressionOptions> compressionOptions(MediaType media,
                                                          RecordingQuality quality) override {
    if (!compressible.contains(media)) return std::nullopt;
    return LMRCompressionOptions{.media = media, .quality = quality};
  }
};

}  // namespace lmx::testing

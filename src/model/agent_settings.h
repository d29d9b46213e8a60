// The settings that the preferences file gives the agent.
#pragma once
#include <array>
#include <cstdint>
#include <optional>
#include <string>

#include "model/continuous_recording.h"
#include "support/shared_value.h"

namespace lmx {

/// Who the agent is, and how it reaches its server. Fields are thread-safe; a text that nobody has set is
/// absent.
struct ServerSettings {
  using Text = std::optional<std::string>;
  using Secret = std::array<unsigned char, 16>;

  SharedValue<Text> machine_name;
  SharedValue<Text> machine_uuid;  ///< the camera's
  SharedValue<Text> server_uuid;
  SharedValue<std::optional<Secret>> shared_secret;  ///< the tunnel's key
  SharedValue<std::uint16_t> tcp_listener_port;      ///< network byte order; 0: no direct TCP channel
  SharedValue<Text> lumex_url;
  SharedValue<Text> tunnel_host;
  SharedValue<Text> tunnel_port;
};

/// What is recorded and where it goes. Fields are thread-safe; a text that nobody has set is absent.
struct RecordingDefaults {
  using Text = std::optional<std::string>;

  SharedValue<Text> recording_repository_path;
  SharedValue<Text> recording_type;
  SharedValue<Text> input_file;    ///< of "File" recordings
  SharedValue<Text> preview_file;  ///< a picture to show instead of the camera's
  SharedValue<Text> preview_directory;
  SharedValue<Text> capture_preset;
  SharedValue<Text> recording_audio_channel;
  SharedValue<Text> recording_audio_input;
  SharedValue<Text> recording_audio_sample_rate;
  SharedValue<Text> recording_video_maximum_frame_rate;
  /// Absent only once the context has been taken apart.
  SharedValue<std::optional<LMRContinuousRecordingInfo>> continuous{LMRContinuousRecordingInfo{}};

  /// Whether the capture runs all the time and commands only mark times.
  [[nodiscard]] bool isContinuous() const {
    const auto info = continuous.get();
    return info && info->enabled;
  }
};

}  // namespace lmx

// The agent's settings from the preferences file.
#pragma once
#include <array>
#include <cstdint>
#include <optional>
#include <string>

#include "model/continuous_recording.h"
#include "support/shared_value.h"

namespace lmx {

/// The agent's identity, and how it reaches its server. Fields are thread-safe. A text that was never set is
/// absent.
struct ServerSettings {
  using Text = std::optional<std::string>;
  using Secret = std::array<unsigned char, 16>;

  SharedValue<Text> machine_name;
  SharedValue<Text> machine_uuid;  ///< of the camera
  SharedValue<Text> server_uuid;
  SharedValue<std::optional<Secret>> shared_secret;  ///< key of the tunnel
  SharedValue<std::uint16_t> tcp_listener_port;      ///< network byte order; 0: no direct TCP channel
  SharedValue<Text> lumex_url;
  SharedValue<Text> tunnel_host;
  SharedValue<Text> tunnel_port;
};

/// What is recorded, and where it is written. Fields are thread-safe. A text that was never set is absent.
struct RecordingDefaults {
  using Text = std::optional<std::string>;

  SharedValue<Text> recording_repository_path;
  SharedValue<Text> recording_type;
  SharedValue<Text> input_file;    ///< input of "File" recordings
  SharedValue<Text> preview_file;  ///< a picture to show instead of the camera's
  SharedValue<Text> preview_directory;
  SharedValue<Text> capture_preset;
  SharedValue<Text> recording_audio_channel;
  SharedValue<Text> recording_audio_input;
  SharedValue<Text> recording_audio_sample_rate;
  SharedValue<Text> recording_video_maximum_frame_rate;
  /// Absent only after the context's cleanup.
  SharedValue<std::optional<LMRContinuousRecordingInfo>> continuous{LMRContinuousRecordingInfo{}};

  /// Whether the capture runs all the time and commands only mark times in it.
  [[nodiscard]] bool isContinuous() const {
    const auto info = continuous.get();
    return info && info->enabled;
  }
};

}  // namespace lmx

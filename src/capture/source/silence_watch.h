// Notices when a camera or a microphone has stopped delivering.
#pragma once
#include <atomic>
#include <cstdint>

namespace lmx {

/// Remembers, by the steady clock, when the camera and the microphone last delivered something. Thread-safe.
class SilenceWatch {
 public:
  /// Something has just come from that device.
  void heardVideo() { last_video_ms_ = now(); }
  void heardAudio() { last_audio_ms_ = now(); }
  /// Starts counting anew for both.
  void restart();
  /// Whether nothing has come for more than two seconds.
  [[nodiscard]] bool videoSilent() const { return silentSince(last_video_ms_); }
  [[nodiscard]] bool audioSilent() const { return silentSince(last_audio_ms_); }

 private:
  static constexpr std::int64_t kLimitMs = 2000;
  static std::int64_t now();
  static bool silentSince(std::int64_t ms) { return now() - ms > kLimitMs; }
  std::atomic<std::int64_t> last_video_ms_{now()};
  std::atomic<std::int64_t> last_audio_ms_{now()};
};

}  // namespace lmx

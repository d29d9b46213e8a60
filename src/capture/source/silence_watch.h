// Notices devices that have stopped to deliver.
#pragma once
#include <atomic>
#include <cstdint>

namespace lmx {

/// When something last came from the camera and from the microphone, by the steady clock. Thread-safe.
class SilenceWatch {
 public:
  /// Takes note that it came now.
  void heardVideo() { last_video_ms_ = now(); }
  void heardAudio() { last_audio_ms_ = now(); }
  /// Both get their full time again.
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

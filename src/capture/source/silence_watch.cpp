// The steady clock in milliseconds.
#include "capture/source/silence_watch.h"

#include <chrono>

namespace lmx {

void SilenceWatch::restart() { last_video_ms_ = last_audio_ms_ = now(); }

std::int64_t SilenceWatch::now() {
  const auto time = std::chrono::steady_clock::now().time_since_epoch();
  return std::chrono::duration_cast<std::chrono::milliseconds>(time).count();
}

}  // namespace lmx

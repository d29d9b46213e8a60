// The picture encoders that a machine may have, and which of them works here.
#pragma once
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "capture/gst/encoding.h"

namespace lmx {

/// The kinds that are known, the cheapest for the machine first. The last one, x264, works everywhere.
const std::vector<VideoEncoderKind>& knownVideoEncoders();

/// Encodes a few small frames with holes between them and a key frame on demand. Blocks, for some seconds at
/// most.
/// @return why recordings can't use it; nothing if they can
std::optional<std::string> tryVideoEncoder(const VideoEncoderKind& kind);

/// What recordings of this process encode pictures with. Thread-safe.
class VideoEncoderChoice {
 public:
  static VideoEncoderChoice& instance();

  /// Chooses the first of `kinds` that works. Until that has ended, and if none works, recordings use x264.
  /// Blocks. Logs the choice.
  void tryOut(const std::vector<VideoEncoderKind>& kinds);
  /// For the recording that begins now. Does not wait.
  void apply(VideoEncoding& video) const;
  /// A recording encoded as `video` has lost frames because the encoder was too slow: the next one takes the
  /// next cheaper setting, until the process ends. Says so in the log, if there is one.
  void fellBehind(const VideoEncoding& video);

  /// An encoder has failed in a recording. Hardware is not taken again until the process ends; says so in the
  /// log.
  void failed(const VideoEncoding& video);

 private:
  mutable std::mutex mutex_;
  std::optional<VideoEncoderKind> kind_;  // guarded by mutex_: absent for x264
  int effort_saved_ = 0;                  // guarded by mutex_: steps
};

}  // namespace lmx

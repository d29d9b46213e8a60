// Gives each encoded frame its length: until the next one. Pure.
#pragma once
#include <cstdint>
#include <optional>

#include "capture/movie/growing_movie.h"

namespace lmx {

/// Holds the newest frame back, since only the next one, or the end, tells how long it is shown. Where a
/// frame is missing the one before it lasts longer; nothing is encoded twice. Not thread-safe.
class FrameHold {
 public:
  /// @param frameDuration  timescale units of a frame of the movie's clock
  explicit FrameHold(std::uint32_t frameDuration) : frame_duration_(frameDuration) {}

  /// @param place  frame number on the movie's clock; places ascend, possibly with holes
  /// @return the frame before, if there is one; it lasts until `place`
  std::optional<EncodedSample> next(EncodedSample frame, std::uint32_t place);
  /// The newest frame. @param end  the place behind it; absent: it lasts one frame
  std::optional<EncodedSample> last(std::optional<std::uint32_t> end);

 private:
  std::optional<EncodedSample> releaseUntil(std::uint32_t end);

  const std::uint32_t frame_duration_;
  std::optional<EncodedSample> held_;
  std::uint32_t start_ = 0;  ///< where the held frame begins: a hole in front of the first one is its own
  std::uint32_t place_ = 0;  ///< of the held frame
};

}  // namespace lmx

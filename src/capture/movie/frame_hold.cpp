// Lengths of frames from their places.
#include "capture/movie/frame_hold.h"

#include <algorithm>
#include <utility>

namespace lmx {

std::optional<EncodedSample> FrameHold::next(EncodedSample frame, std::uint32_t place) {
  auto before = releaseUntil(place);
  held_ = std::move(frame);
  place_ = std::max(place, start_);
  return before;
}

std::optional<EncodedSample> FrameHold::last(std::optional<std::uint32_t> end) {
  return releaseUntil(end.value_or(place_ + 1));
}

std::optional<EncodedSample> FrameHold::releaseUntil(std::uint32_t end) {
  if (!held_) return std::nullopt;
  end = std::max(end, place_ + 1);
  held_->duration = (end - start_) * frame_duration_;
  start_ = end;
  return std::exchange(held_, std::nullopt);
}

}  // namespace lmx

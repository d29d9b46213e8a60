// Copies ranges of a movie into a new one without encoding.
#pragma once
#include <cstdint>
#include <string>
#include <vector>

#include "capture/movie/movie_index.h"

namespace lmx {

/// A half-open range of frames of the movie's clock.
struct FrameRange {
  std::uint32_t first = 0;
  std::uint32_t end = 0;
  bool operator==(const FrameRange&) const = default;
};

/// Copies `ranges` of `source` to the new movie `target`. The copy is synced but bears its name from the
/// start, so give a temporary one. A range that does not begin with a key frame begins with the one before
/// it; one that begins while a frame is shown for longer begins with that frame shortened, or, if that is
/// none, with a key frame that follows it. The first sound heard is exact to the sample; each later range of
/// sound begins with the packet that comes nearest, and the rounding error is carried on.
/// @param index  of `source`
/// @param frameSeconds  length of a frame of `ranges`
/// @return 0 or the errno; half a copy may be left then
int copyMovieRanges(const std::string& source, const MovieIndex& index, const std::vector<FrameRange>& ranges,
                    double frameSeconds, const std::string& target);

}  // namespace lmx

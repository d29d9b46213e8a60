// Which frames of a capture's movie belong to a request. Pure.
#pragma once
#include <cstdint>
#include <vector>

#include "capture/media/frame_cutter.h"
#include "capture/media/request_marks.h"
#include "capture/movie/movie_copy.h"

namespace lmx {

/// The frames of `request` among those of `runs`. Ranges ascend; ranges that touch are joined.
std::vector<FrameRange> framesOf(const Request& request, const std::vector<MovieRun>& runs,
                                 double frameSeconds, std::uint32_t totalFrames);

/// Whether `ranges` are all of the frames.
bool coversAll(const std::vector<FrameRange>& ranges, std::uint32_t totalFrames);

}  // namespace lmx

// From spans of time to ranges of frames.
#include "capture/store/request_frames.h"

#include <algorithm>
#include <cmath>

namespace lmx {
namespace {

/// The frames of `run` that `span` covers, counted from the start of the movie.
FrameRange framesIn(const Span& span, const MovieRun& run, std::uint32_t runEnd, double frameSeconds) {
  const double frames = runEnd > run.firstFrame ? runEnd - run.firstFrame : 0;
  // The first frame at or after a mark; 1/1000 of a frame absorbs the rounding of the marks.
  const auto frameAt = [&](double t) {
    const double frame = std::ceil((t - run.sessionTime) / frameSeconds - 1e-3);
    return run.firstFrame + static_cast<std::uint32_t>(std::clamp(frame, 0.0, frames));
  };
  return {frameAt(span.start), frameAt(span.stop)};
}

void append(std::vector<FrameRange>& ranges, const FrameRange& range) {
  if (range.first >= range.end) return;
  if (!ranges.empty() && ranges.back().end >= range.first) {
    ranges.back().end = std::max(ranges.back().end, range.end);
  } else {
    ranges.push_back(range);
  }
}

}  // namespace

std::vector<FrameRange> framesOf(const Request& request, const std::vector<MovieRun>& runs,
                                 double frameSeconds, std::uint32_t totalFrames) {
  std::vector<FrameRange> ranges;
  if (frameSeconds <= 0) return ranges;
  for (std::size_t i = 0; i < runs.size(); ++i) {
    // Media that could not be read to their end hold fewer frames than the journal mentions.
    const std::uint32_t runEnd =
        i + 1 < runs.size() ? std::min(runs[i + 1].firstFrame, totalFrames) : totalFrames;
    for (const Span& span : request.spans) append(ranges, framesIn(span, runs[i], runEnd, frameSeconds));
  }
  // A request that ended before the first frame still gets that frame.
  if (ranges.empty() && totalFrames > 0 && !request.spans.empty() && !runs.empty() &&
      request.spans.front().start <= runs.front().sessionTime) {
    ranges.push_back({0, 1});
  }
  return ranges;
}

bool coversAll(const std::vector<FrameRange>& ranges, std::uint32_t totalFrames) {
  return ranges.size() == 1 && ranges.front().first == 0 && ranges.front().end >= totalFrames;
}

}  // namespace lmx

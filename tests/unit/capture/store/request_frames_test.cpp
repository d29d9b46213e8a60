// Spans to ranges of frames.
#include "capture/store/request_frames.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

constexpr double kFrame = 1.0 / 30.0;

TEST(FramesOf, RoundsMarksUpToFrames) {
  const std::vector<MovieRun> runs{{.sessionTime = 10, .firstFrame = 0},
                                   {.sessionTime = 20, .firstFrame = 30}};
  Request request{.uuid = "R", .parameters = nullptr, .spans = {{10.05, 10.5}, {20.0, 20.2}}};
  EXPECT_EQ(framesOf(request, runs, kFrame, 60), (std::vector<FrameRange>{{2, 15}, {30, 36}}));
  request.spans = {{9, 30}};
  EXPECT_TRUE(coversAll(framesOf(request, runs, kFrame, 60), 60));
  request.spans = {{11, 12}};
  EXPECT_TRUE(framesOf(request, runs, kFrame, 60).empty());
}

TEST(FramesOf, AreThoseThatAreThere) {
  const std::vector<MovieRun> runs{{.sessionTime = 0, .firstFrame = 0},
                                   {.sessionTime = 20, .firstFrame = 300}};
  const Request request{.uuid = "R", .parameters = nullptr, .spans = {{.start = 0}}};
  EXPECT_EQ(framesOf(request, runs, kFrame, 100), (std::vector<FrameRange>{{0, 100}}));
}

}  // namespace
}  // namespace lmx

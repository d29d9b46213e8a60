// How long each frame is shown.
#include "capture/movie/frame_hold.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

/// Lengths of frames that were pushed at `places`, in frames of the movie's clock.
std::vector<std::uint32_t> lengths(const std::vector<std::uint32_t>& places,
                                   std::optional<std::uint32_t> end) {
  FrameHold hold(1001);
  std::vector<std::uint32_t> result;
  const auto note = [&](const std::optional<EncodedSample>& frame) {
    if (!frame) return;
    EXPECT_EQ(frame->duration % 1001, 0U);
    EXPECT_EQ(frame->data, Bytes{static_cast<std::uint8_t>(result.size())}) << "in order";
    result.push_back(frame->duration / 1001);
  };
  std::uint8_t number = 0;
  for (const std::uint32_t place : places) note(hold.next({.data = {number++}}, place));
  note(hold.last(end));
  return result;
}

TEST(FrameHold, AFrameLastsUntilTheNextOne) {
  using Lengths = std::vector<std::uint32_t>;
  EXPECT_EQ(lengths({0, 1, 2}, 3), (Lengths{1, 1, 1}));
  EXPECT_EQ(lengths({0, 1, 4, 5}, 6), (Lengths{1, 3, 1, 1})) << "a hole in the middle";
  EXPECT_EQ(lengths({2, 3}, 4), (Lengths{3, 1})) << "in front";
  EXPECT_EQ(lengths({0, 1}, 9), (Lengths{1, 8})) << "at the end";
  EXPECT_EQ(lengths({0, 1}, std::nullopt), (Lengths{1, 1})) << "at an end that nobody knows";
  EXPECT_EQ(lengths({5}, std::nullopt), (Lengths{6}));
  EXPECT_EQ(lengths({}, 7), Lengths{}) << "no frame at all";
  EXPECT_EQ(lengths({0, 1, 2}, 1), (Lengths{1, 1, 1})) << "no frame is lost to a wrong end";
  EXPECT_EQ(lengths({3, 3, 4}, 6), (Lengths{4, 1, 1})) << "nor to a wrong place";
}

}  // namespace
}  // namespace lmx

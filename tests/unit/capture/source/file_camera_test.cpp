// A movie file as a live camera.
#include <gtest/gtest.h>

#include <thread>

#include "support/time_value.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/movie_check.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Capture;
using testing::decodeMovie;
using testing::Folder;
using testing::parametersFor;
using Kind = testing::Reports::Kind;

/// A movie of two seconds with frame numbers and ticks, made by the framework itself.
std::string makeSource(const Folder& folder) {
  Capture capture(folder, "test://video?size=320x180&speed=max", "test://audio?speed=max");
  EXPECT_TRUE(capture.prepare());
  const double zero = capture.zero();
  capture.controller->setStartWithUUID("source", zero, parametersFor("source"));
  capture.controller->setStopWithUUID("source", zero + 2);
  capture.controller->startRecording();
  capture.controller->stopRecording();
  EXPECT_EQ(capture.reports->wait(), Kind::complete);
  EXPECT_FALSE(capture.controller->processRequestWithUUID("source", folder.file("source.mov")));
  capture.controller->requestHandedOver("source");
  return folder.file("source.mov");
}

TEST(FileCamera, PlaysInRealTimeAndLoopsWithItsSound) {
  const Folder folder;
  const std::string camera = "file://" + makeSource(folder);
  Capture capture(folder, camera, camera);
  ASSERT_TRUE(capture.prepare());
  const double start = secondsSinceReferenceDate();
  capture.controller->setStartWithUUID("R", start, parametersFor("R"));
  capture.controller->startRecording();
  std::this_thread::sleep_for(3500ms);  // longer than the file
  const double stop = secondsSinceReferenceDate();
  capture.controller->setStopWithUUID("R", stop);
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
  const auto movie = decodeMovie(folder.file("R.mov"));
  EXPECT_EQ(movie.problem, "");
  ASSERT_FALSE(movie.frameTimes.empty());
  EXPECT_NEAR(static_cast<double>(movie.frameNumbers.size()) / 30.0, stop - start, 0.1);
  EXPECT_LT(movie.frameNumbers.back(), movie.frameNumbers.front() + 60);  // it began again
  const auto ticks = testing::tickTimes(movie);
  ASSERT_GE(ticks.size(), 3U);
  for (std::size_t i = 1; i < ticks.size(); ++i) EXPECT_NEAR(ticks[i] - ticks[i - 1], 1.0, 0.06);
}

}  // namespace
}  // namespace lmx

// Recordings with the synthetic devices, from the marks to the movie.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "capture/movie/movie_copy.h"
#include "capture/movie/movie_reader.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/movie/movie_check.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Capture;
using testing::decodeMovie;
using testing::Folder;
using testing::kFastAudio;
using testing::kFastVideo;
using testing::kTickLead;
using testing::numberRuns;
using testing::parametersFor;
using Kind = testing::Reports::Kind;

/// Records `spans` (seconds of media) as fast as the machine can. @return the movie's path.
std::string recordFast(const Folder& folder, Capture& capture, const std::vector<Span>& spans,
                       const std::string& name = "R") {
  EXPECT_TRUE(capture.prepare());
  const double zero = capture.zero();
  for (const Span& span : spans) {
    capture.controller->setStartWithUUID("R", zero + span.start, parametersFor("R"));
    capture.controller->setStopWithUUID("R", zero + span.stop);
  }
  EXPECT_TRUE(capture.controller->startRecording());
  capture.controller->stopRecording();
  EXPECT_EQ(capture.reports->wait(600s), Kind::complete);
  EXPECT_FALSE(capture.reports->error());
  const auto error = capture.controller->processRequestWithUUID("R", folder.file(name + ".mov"));
  EXPECT_FALSE(error) << error->message;
  capture.controller->requestHandedOver("R");
  return folder.file(name + ".mov");
}

TEST(Recording, HoldsExactlyItsSpans) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  const auto movie = decodeMovie(recordFast(folder, capture, {{1.0, 3.0}, {5.5, 6.25}, {9.0, 10.0}}));
  EXPECT_EQ(movie.problem, "");
  const auto runs = numberRuns(movie.frameNumbers);
  ASSERT_EQ(runs.size(), 3U);
  EXPECT_EQ(runs[0].first, 30U);
  EXPECT_EQ(runs[0].last, 89U);
  EXPECT_EQ(runs[1].first, 165U);
  EXPECT_EQ(runs[1].last, 187U);
  EXPECT_EQ(runs[2].first, 270U);
  EXPECT_EQ(runs[2].last, 299U);
}

TEST(Recording, FrameRateIsConstantOverCuts) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  capture.settings.maximumFrameRate = 29.97;
  const auto movie = decodeMovie(recordFast(folder, capture, {{0.5, 1.7}, {2.1, 3.3}}));
  ASSERT_GT(movie.frameTimes.size(), 60U);
  for (std::size_t i = 0; i < movie.frameTimes.size(); ++i) {
    EXPECT_NEAR(movie.frameTimes[i], static_cast<double>(i) * 1001.0 / 30000.0, 1e-6);
  }
}

TEST(Recording, SoundStaysWithThePictureOverCuts) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  const auto movie = decodeMovie(recordFast(folder, capture, {{0.5, 3.5}, {10.25, 14.25}, {20.9, 23.1}}));
  EXPECT_NEAR(movie.soundStart, 0.0, 1e-6);
  // The microphone ticks just before the camera's frame number becomes a multiple of 30.
  std::vector<double> expected;
  for (std::size_t i = 0; i < movie.frameNumbers.size(); ++i) {
    if (movie.frameNumbers[i] % 30 == 0) expected.push_back(movie.frameTimes[i]);
  }
  const auto ticks = testing::tickTimes(movie);
  ASSERT_EQ(ticks.size(), expected.size());
  for (std::size_t i = 0; i < ticks.size(); ++i) EXPECT_NEAR(ticks[i], expected[i] - kTickLead, 0.001) << i;
}

/// Under a sanitizer everything is many times slower: the same drift in less media.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr double kDriftSeconds = 60;
#else
constexpr double kDriftSeconds = 1800;
#endif

TEST(Recording, DoesNotDriftInThirtyMinutes) {
  const Folder folder;
  Capture capture(folder, "test://video?size=64x64&speed=max", kFastAudio);
  const auto movie = decodeMovie(recordFast(folder, capture, {{0.0, kDriftSeconds}}));
  ASSERT_EQ(movie.frameTimes.size(), static_cast<std::size_t>(kDriftSeconds * 30));
  const auto ticks = testing::tickTimes(movie);
  ASSERT_EQ(ticks.size(), static_cast<std::size_t>(kDriftSeconds));
  for (std::size_t i = 0; i < ticks.size(); ++i)
    ASSERT_NEAR(ticks[i], static_cast<double>(i + 1) - kTickLead, 0.001) << i;
}

/// The first sound of a copy is exact to the sample, each later range is off by half a packet at most.
TEST(Recording, SoundStaysWithThePictureInCopies) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  const std::string path = recordFast(folder, capture, {{0.0, 20.0}});
  const auto index = readMovieIndex(path);
  ASSERT_TRUE(index);
  constexpr double kHalfPacket = 512.0 / 48000.0;
  for (const auto& ranges : std::vector<std::vector<FrameRange>>{
           {{0, 600}}, {{7, 130}}, {{555, 556}}, {{1, 95}, {131, 277}, {300, 333}, {401, 590}}}) {
    const std::string copy = folder.file("copy.mov");
    ASSERT_EQ(copyMovieRanges(path, *index, ranges, 1.0 / 30.0, copy), 0);
    const auto movie = decodeMovie(copy);
    EXPECT_EQ(movie.problem, "");
    EXPECT_NEAR(movie.soundStart, 0.0, 1e-6);
    std::vector<double> expected;
    for (std::size_t i = 0; i < movie.frameNumbers.size(); ++i) {
      const bool last = i + 1 == movie.frameNumbers.size();
      if (!last && movie.frameTimes[i + 1] - movie.frameTimes[i] < 0.005) continue;  // only decoded
      if (movie.frameNumbers[i] % 30 == 29) expected.push_back(movie.frameTimes[i] + 1.0 / 30.0);
    }
    const auto ticks = testing::tickTimes(movie);
    ASSERT_EQ(ticks.size(), expected.size()) << ranges.front().first;
    for (std::size_t i = 0; i < ticks.size(); ++i) {
      const bool first = ticks[i] < (ranges.front().end - ranges.front().first) / 30.0;
      EXPECT_NEAR(ticks[i], expected[i] - kTickLead, first ? 0.0005 : kHalfPacket + 0.0005) << i;
    }
    EXPECT_NEAR(static_cast<double>(movie.sound.size()) / movie.sampleRate,
                movie.frameTimes.back() + 1.0 / 30.0, 0.022);
  }
}

/// Two minutes, or LMX_HOURS of media (12 take some minutes).
double longRecording() {
  const char* hours = std::getenv("LMX_HOURS");
  return hours == nullptr ? 120 : std::round(std::strtod(hours, nullptr) * 3600);
}

TEST(Recording, TheTailOfALongRecordingIsInStep) {
  const Folder folder;
  Capture capture(folder, "test://video?size=64x64&speed=max", kFastAudio);
  ASSERT_TRUE(capture.prepare());
  const double zero = capture.zero();
  const double end = longRecording();
  capture.controller->setStartWithUUID("all", zero, parametersFor("all"));
  capture.controller->setStartWithUUID("tail", zero + end - 30, parametersFor("tail"));
  for (const char* request : {"all", "tail"}) capture.controller->setStopWithUUID(request, zero + end);
  ASSERT_TRUE(capture.controller->startRecording());
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(3600s), Kind::complete);
  ASSERT_FALSE(capture.controller->processRequestWithUUID("tail", folder.file("tail.mov")));
  const auto movie = decodeMovie(folder.file("tail.mov"));
  ASSERT_EQ(movie.frameNumbers.size(), 900U);
  EXPECT_EQ(movie.frameNumbers.front(), static_cast<std::uint32_t>(end - 30) * 30);
  const auto ticks = testing::tickTimes(movie);
  ASSERT_EQ(ticks.size(), 30U);
  for (std::size_t i = 0; i < ticks.size(); ++i)
    EXPECT_NEAR(ticks[i], static_cast<double>(i + 1) - kTickLead, 0.005)
        << "sound against picture, second " << i;
}

TEST(Recording, CopiesOfSoundAloneAreExactToo) {
  const Folder folder;
  Capture capture(folder, "", kFastAudio);
  const std::string path = recordFast(folder, capture, {{0.0, 6.005}});
  const auto index = readMovieIndex(path);
  ASSERT_TRUE(index);
  ASSERT_EQ(copyMovieRanges(path, *index, {{37, 437}}, 0.01, folder.file("copy.mov")), 0);
  const auto movie = decodeMovie(folder.file("copy.mov"), testing::Streams::sound);
  const auto ticks = testing::tickTimes(movie);
  ASSERT_EQ(ticks.size(), 4U);
  for (std::size_t i = 0; i < ticks.size(); ++i)
    EXPECT_NEAR(ticks[i], static_cast<double>(i + 1) - 0.37 - kTickLead, 0.0005) << i;
  EXPECT_NEAR(static_cast<double>(movie.sound.size()) / movie.sampleRate, 4.0, 0.022);
}

TEST(Recording, SoundOnly) {
  const Folder folder;
  Capture capture(folder, "", kFastAudio);
  const auto movie =
      decodeMovie(recordFast(folder, capture, {{0.5, 2.5}, {4.5, 6.0}}), testing::Streams::sound);
  EXPECT_EQ(movie.problem, "");
  EXPECT_TRUE(movie.frameNumbers.empty());
  EXPECT_NEAR(static_cast<double>(movie.sound.size()) / movie.sampleRate, 3.5, 0.03);
  const auto ticks = testing::tickTimes(movie);  // of seconds 1, 2, 5 and 6 of the session
  const std::vector<double> expected{0.5, 1.5, 2.5, 3.5};
  ASSERT_EQ(ticks.size(), expected.size());
  for (std::size_t i = 0; i < ticks.size(); ++i) EXPECT_NEAR(ticks[i], expected[i] - kTickLead, 0.001) << i;
}

TEST(Recording, PictureOnly) {
  const Folder folder;
  Capture capture(folder, kFastVideo, "");
  const auto movie = decodeMovie(recordFast(folder, capture, {{0.0, 2.0}}), testing::Streams::picture);
  EXPECT_EQ(movie.problem, "");
  EXPECT_TRUE(movie.sound.empty());
  EXPECT_EQ(movie.frameNumbers.size(), 60U);
}

TEST(Recording, LeavesNothingButTheMovie) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  recordFast(folder, capture, {{0.0, 1.0}});
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder.path()))
    names.push_back(entry.path().filename());
  EXPECT_EQ(names, std::vector<std::string>{"R.mov"});
}

TEST(Recording, ElapsedTimesCountMarkedSpansOnly) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  recordFast(folder, capture, {{1.0, 3.0}, {5.0, 6.5}});
  EXPECT_NEAR(capture.controller->elapsedTimeForRequestWithUUID("R"), 3.5, 1e-6);
  EXPECT_EQ(capture.controller->elapsedTimeInMilliseconds(), 3500);
  EXPECT_EQ(capture.controller->elapsedTimeForRequestWithUUID("unknown"), 0);
}

/// Its time is its own: it has nothing to do with how long this process has been running.
TEST(Recording, AFastDeviceThatIsLostLeavesAllThatItGave) {
  const std::string lost = "&lost-after=20";
  for (const std::string& video : {kFastVideo + lost, std::string()}) {
    const Folder folder;
    Capture capture(folder, video, video.empty() ? kFastAudio + lost : kFastAudio);
    ASSERT_TRUE(capture.prepare());
    capture.controller->setStartWithUUID("R", capture.zero(), parametersFor("R"));
    ASSERT_TRUE(capture.controller->startRecording());
    ASSERT_EQ(capture.reports->wait(), Kind::complete);
    EXPECT_TRUE(capture.reports->error());
    EXPECT_NEAR(capture.controller->elapsedTimeForRequestWithUUID("R"), 20, 0.1);
    EXPECT_NEAR(static_cast<double>(capture.controller->elapsedTimeInMilliseconds()), 20000, 100);
    capture.controller->cancelRequestWithUUID("R");
  }
}

TEST(Recording, AFastDeviceThatWasNeverStartedEndsAtOnce) {
  for (const bool cancel : {true, false}) {
    const Folder folder;
    Capture capture(folder, kFastVideo, kFastAudio);
    ASSERT_TRUE(capture.prepare());
    capture.controller->setStartWithUUID("R", capture.zero(), parametersFor("R"));
    cancel ? capture.controller->cancelRecording() : capture.controller->stopRecording();
    EXPECT_EQ(capture.reports->wait(20s), cancel ? Kind::cancel : Kind::complete);
  }
}

TEST(Recording, AFileThatBearsTheNameIsSetAside) {
  const Folder folder;
  for (int i = 0; i < 2; ++i) {
    Capture capture(folder, kFastVideo, kFastAudio);
    recordFast(folder, capture, {{0.0, 1.0}});
  }
  EXPECT_EQ(decodeMovie(folder.file("R-replaced.mov")).frameNumbers.size(), 30U);
  EXPECT_EQ(decodeMovie(folder.file("R.mov")).frameNumbers.size(), 30U);
}

TEST(Recording, AnEarlierMovieGoesAsideWithItsDocument) {
  const Folder folder;
  std::ofstream(folder.file("R.mov")) << "earlier";
  std::ofstream(folder.file("R.xml")) << "its document";
  std::ofstream(folder.file("R-replaced.xml")) << "of an even earlier one";
  Capture capture(folder, kFastVideo, kFastAudio);
  recordFast(folder, capture, {{0.0, 0.5}});
  std::ifstream document(folder.file("R-replaced-1.xml"));
  EXPECT_EQ(std::string((std::istreambuf_iterator<char>(document)), {}), "its document");
  EXPECT_TRUE(std::filesystem::exists(folder.file("R-replaced-1.mov")));
  EXPECT_FALSE(std::filesystem::exists(folder.file("R.xml")));
}

TEST(Recording, AnEarlierMovieOfALongNameGoesAside) {
  const Folder folder;
  const std::string name(251, 'N');
  std::ofstream(folder.file(name + ".mov")) << "earlier";
  Capture capture(folder, kFastVideo, kFastAudio);
  recordFast(folder, capture, {{0.0, 0.5}}, name);
  EXPECT_TRUE(std::filesystem::exists(folder.file(std::string(200, 'N') + "-replaced.mov")));
}

TEST(Recording, TheSyntheticMicrophoneIsNeverLouderThanItsTick) {
  const Folder folder;
  for (int i = 0; i < 20; ++i) {  // what it left in memory was not the same each time
    Capture capture(folder, "", kFastAudio);
    const auto movie = decodeMovie(recordFast(folder, capture, {{3.8634, 5.8634}}), testing::Streams::sound);
    ASSERT_FALSE(movie.sound.empty());
    const auto [low, high] = std::minmax_element(movie.sound.begin(), movie.sound.end());
    ASSERT_TRUE(*low > -0.95F && *high < 0.95F) << *low << " … " << *high;
  }
}

}  // namespace
}  // namespace lmx

// Recordings in real time: commands, faults, lost devices, and what can't be prepared.
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <thread>

#include "model/codes.h"
#include "support/time_value.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/capture/failing_sync.h"
#include "tests/unit/capture/movie/movie_check.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Capture;
using testing::decodeMovie;
using testing::Folder;
using testing::kFastAudio;
using testing::kFastVideo;
using testing::kTickLead;
using testing::LogCapture;
using testing::numberRuns;
using testing::parametersFor;
using Kind = testing::Reports::Kind;

TEST(LiveRecording, ADiskThatLosesDataIsSaid) {
  LogCapture log;
  const Folder folder;
  Capture capture(folder);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  ASSERT_TRUE(capture.controller->startRecording());
  while (capture.controller->elapsedTimeInMilliseconds() < 200) std::this_thread::sleep_for(10ms);
  testing::failNextSyncs(1);
  ASSERT_TRUE(log.waitForPart("The disk has not kept what was recorded (Input/output error)"));
  const auto recorded = capture.controller->elapsedTimeInMilliseconds();
  while (capture.controller->elapsedTimeInMilliseconds() < recorded + 500) std::this_thread::sleep_for(10ms);
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  ASSERT_TRUE(capture.controller->lastError());
  EXPECT_EQ(capture.controller->lastError()->code, kWriteFailed);
  EXPECT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")))
      << "it is kept all the same";
  EXPECT_GT(decodeMovie(folder.file("R.mov")).frameNumbers.size(), 10U);
}

TEST(LiveRecording, StoppedAtOnceStillHoldsAFrame) {
  const Folder folder;
  for (int i = 0; i < 5; ++i) {
    Capture capture(folder);
    ASSERT_TRUE(capture.prepare());
    capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
    capture.controller->setStopWithUUID("R", secondsSinceReferenceDate());
    capture.controller->stopRecording();
    ASSERT_EQ(capture.reports->wait(), Kind::complete);
    ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
    EXPECT_EQ(decodeMovie(folder.file("R.mov")).frameNumbers.size(), 1U);
    capture.controller->requestHandedOver("R");
  }
}

/// The path comes from a peer, which must not be able to move away or replace anything.
TEST(LiveRecording, WhatHasTheChosenNameStaysAsItIs) {
  const Folder folder;
  std::ofstream(folder.file("a.mov")) << "another's movie";
  std::ofstream(folder.file("a-1.xml")) << "another's document";
  ASSERT_EQ(symlink("nowhere", folder.file("a-2.mov").c_str()), 0);
  std::filesystem::create_directory(folder.file("a-3.mov"));
  LogCapture log;
  Capture capture(folder);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  capture.controller->setStopWithUUID("R", secondsSinceReferenceDate());
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  const auto made = capture.controller->processRequestBeside("R", folder.file("a.mov"));
  ASSERT_TRUE(made);
  EXPECT_EQ(*made, folder.file("a-4.mov"));
  EXPECT_EQ(decodeMovie(*made).frameNumbers.size(), 1U);
  EXPECT_TRUE(log.contains(kLogWarning, "\"" + folder.file("a.mov") +
                                            "\" is there already and stays as it is: " + "the movie is \"" +
                                            folder.file("a-4.mov") + "\""));
  EXPECT_EQ(std::filesystem::file_size(folder.file("a.mov")), 15U);
  EXPECT_TRUE(std::filesystem::is_symlink(folder.file("a-2.mov")));
  EXPECT_TRUE(std::filesystem::is_directory(folder.file("a-3.mov")));
  capture.controller->requestHandedOver("R");
}

TEST(LiveRecording, TwoRequestsOfOneCaptureEachGetTheirSpan) {
  const Folder folder;
  Capture capture(folder);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("A", secondsSinceReferenceDate(), parametersFor("A"));
  std::this_thread::sleep_for(700ms);  // media must pass
  capture.controller->setStartWithUUID("B", secondsSinceReferenceDate(), parametersFor("B"));
  std::this_thread::sleep_for(700ms);
  capture.controller->setStopWithUUID("B", secondsSinceReferenceDate());
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  ASSERT_FALSE(capture.controller->processRequestWithUUID("B", folder.file("B.mov")));
  capture.controller->requestHandedOver("B");
  const auto kept = capture.controller->recoverAbandonedRequests();
  ASSERT_EQ(kept.size(), 1U);
  EXPECT_EQ(kept[0].path, folder.file("A.mov"));
  kept[0].forget();
  const auto second = decodeMovie(folder.file("B.mov")).frameNumbers;
  const auto first = decodeMovie(folder.file("A.mov")).frameNumbers;
  EXPECT_NEAR(static_cast<double>(second.size()), 21, 2);
  ASSERT_GT(first.size(), second.size());
  EXPECT_EQ(numberRuns(first).size(), 1U);
  EXPECT_LE(first.back() - second.back(), 1U) << "a frame may come between the end of B and that of A";
  EXPECT_FALSE(std::filesystem::exists(folder.file(".lmxagentd")));
}

TEST(LiveRecording, CancelledLeavesNothing) {
  const Folder folder;
  Capture capture(folder);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  std::this_thread::sleep_for(300ms);
  capture.controller->cancelRequestWithUUID("R");
  capture.controller->cancelRecording();
  EXPECT_EQ(capture.reports->wait(), Kind::cancel);
  EXPECT_TRUE(capture.controller->recoverAbandonedRequests().empty());
  EXPECT_TRUE(std::filesystem::is_empty(folder.path()));
}

TEST(LiveRecording, CancelKeepsTheRequestThatNobodyCancelled) {
  const Folder folder;
  Capture capture(folder);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("A", secondsSinceReferenceDate(), parametersFor("A"));
  std::this_thread::sleep_for(300ms);
  capture.controller->setStartWithUUID("B", secondsSinceReferenceDate(), parametersFor("B"));
  capture.controller->cancelRequestWithUUID("B");
  capture.controller->cancelRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::cancel);
  const auto kept = capture.controller->recoverAbandonedRequests();
  ASSERT_EQ(kept.size(), 1U);
  EXPECT_GE(decodeMovie(kept[0].path).frameNumbers.size(), 6U);
}

TEST(LiveRecording, PauseWithoutMarksLeavesTheMediaOut) {
  const Folder folder;
  Capture capture(folder);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  capture.controller->startRecording();
  std::this_thread::sleep_for(400ms);
  capture.controller->pauseRecording();
  EXPECT_EQ(capture.controller->recordingState(), kCapturePaused);
  std::this_thread::sleep_for(500ms);
  capture.controller->resumeRecording();
  EXPECT_EQ(capture.controller->recordingState(), kCaptureRecording);
  std::this_thread::sleep_for(400ms);
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  EXPECT_EQ(capture.controller->recordingState(), kCaptureIdle);
  ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
  const auto runs = numberRuns(decodeMovie(folder.file("R.mov")).frameNumbers);
  ASSERT_EQ(runs.size(), 2U);
  EXPECT_NEAR(static_cast<double>(runs[1].first - runs[0].last), 15, 2);
}

TEST(LiveRecording, MaximalDurationEndsIt) {
  const Folder folder;
  Capture capture(folder, kFastVideo, kFastAudio);
  capture.settings.maxDurationMinutes = 1;
  ASSERT_TRUE(capture.prepare());
  const double zero = capture.zero();
  capture.controller->setStartWithUUID("R", zero, parametersFor("R"));
  capture.controller->setStopWithUUID("R", zero + 61);
  capture.controller->startRecording();
  EXPECT_EQ(capture.reports->wait(), Kind::complete);
}

struct Fault {
  const char* video;
  const char* audio;
  int code;
};
class LostDevice : public ::testing::TestWithParam<Fault> {};

TEST_P(LostDevice, EndsTheRecordingWithWhatThereIs) {
  const Folder folder;
  Capture capture(folder, GetParam().video, GetParam().audio);
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  capture.controller->startRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  ASSERT_TRUE(capture.reports->error());
  EXPECT_EQ(capture.reports->error()->code, GetParam().code);
  EXPECT_TRUE(capture.controller->hasShutDown());
  ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
  const auto movie = decodeMovie(
      folder.file("R.mov"), capture.settings.videoEnabled ? testing::Streams::both : testing::Streams::sound);
  EXPECT_EQ(movie.problem, "");
  if (!capture.settings.videoEnabled) return;
  EXPECT_GE(movie.frameNumbers.size(), 15U) << "of the second from the opening of the device to its loss";
  EXPECT_EQ(numberRuns(movie.frameNumbers).size(), 1U);
}

INSTANTIATE_TEST_SUITE_P(
    Faults, LostDevice,
    ::testing::Values(Fault{"test://video?size=320x180&lost-after=1", "test://audio", kDeviceNotFound},
                      Fault{"test://video?size=320x180&eos-after=1", "test://audio?eos-after=1",
                            kStreamEnded},
                      Fault{"test://video?size=320x180&silent-after=1", "test://audio", kDeviceSilent},
                      Fault{"", "test://audio?silent-after=1", kAudioSilent}));

TEST(LostMicrophone, ThePictureGoesOnWithSilenceUntilItIsBack) {
  const Folder folder;
  Capture capture(folder, "test://video?size=160x90", "test://audio?lost-after=1.2");
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  capture.controller->startRecording();
  ASSERT_TRUE(capture.reports->waitForSound(testing::Reports::Sound::lost));
  ASSERT_TRUE(capture.reports->waitForSound(testing::Reports::Sound::back));
  const auto back = capture.controller->elapsedTimeInMilliseconds();
  while (capture.controller->elapsedTimeInMilliseconds() < back + 1100) std::this_thread::sleep_for(10ms);
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  EXPECT_FALSE(capture.reports->error());
  ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
  const auto movie = decodeMovie(folder.file("R.mov"));
  EXPECT_EQ(movie.problem, "");
  EXPECT_EQ(numberRuns(movie.frameNumbers).size(), 1U) << "no picture is lost";
  EXPECT_NEAR(static_cast<double>(movie.sound.size()) / movie.sampleRate,
              static_cast<double>(movie.frameNumbers.size()) / 30, 0.05);
  const auto ticks = testing::tickTimes(movie);
  ASSERT_GE(ticks.size(), 2U) << "before and after";
  for (const double tick : ticks) {
    const auto frame = static_cast<std::size_t>(std::lround((tick + kTickLead) * 30));
    ASSERT_LT(frame, movie.frameNumbers.size() + 1);
    if (frame == movie.frameNumbers.size()) continue;
    EXPECT_EQ(movie.frameNumbers[frame] % 30, 0U) << tick;
  }
  EXPECT_GT(*std::max_element(ticks.begin(), ticks.end()) - *std::min_element(ticks.begin(), ticks.end()),
            2.5);
}

TEST(LostMicrophone, OneThatIsNotThereLeavesSilence) {
  const Folder folder;
  Capture capture(folder, "test://video?size=160x90", "alsa:no-such-card");
  ASSERT_TRUE(capture.prepare());
  ASSERT_TRUE(capture.reports->waitForSound(testing::Reports::Sound::lost));
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  capture.controller->startRecording();
  while (capture.controller->elapsedTimeInMilliseconds() < 2500) std::this_thread::sleep_for(10ms);
  const auto before = std::chrono::steady_clock::now();
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  EXPECT_LT(std::chrono::steady_clock::now() - before, 900ms) << "nobody waits for it";
  ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
  const auto movie = decodeMovie(folder.file("R.mov"));
  EXPECT_EQ(movie.problem, "");
  EXPECT_GE(movie.frameNumbers.size(), 70U);
  EXPECT_NEAR(static_cast<double>(movie.sound.size()) / movie.sampleRate,
              static_cast<double>(movie.frameNumbers.size()) / 30, 0.05);
  EXPECT_EQ(std::count_if(movie.sound.begin(), movie.sound.end(), [](float s) { return s != 0; }), 0);
}

TEST(LostMicrophone, WhereThereIsOnlySoundOneThatIsNotThereIsWaitedFor) {
  const Folder folder;
  Capture capture(folder, "", "alsa:no-such-card");
  ASSERT_TRUE(capture.prepare());
  capture.controller->setStartWithUUID("R", secondsSinceReferenceDate(), parametersFor("R"));
  capture.controller->startRecording();
  while (capture.controller->elapsedTimeInMilliseconds() < 1500) std::this_thread::sleep_for(10ms);
  capture.controller->stopRecording();
  ASSERT_EQ(capture.reports->wait(), Kind::complete);
  ASSERT_FALSE(capture.controller->processRequestWithUUID("R", folder.file("R.mov")));
  const auto movie = decodeMovie(folder.file("R.mov"), testing::Streams::sound);
  EXPECT_NEAR(static_cast<double>(movie.sound.size()) / movie.sampleRate, 2.5, 0.9);
}

TEST(Preparing, AMissingDeviceIsNamed) {
  const Folder folder;
  Capture capture(folder, "file:///nowhere.mov", "test://audio");
  EXPECT_FALSE(capture.prepare());
  ASSERT_TRUE(capture.controller->lastError());
  EXPECT_EQ(capture.controller->lastError()->code, kDeviceNotFound);
  EXPECT_NE(capture.controller->lastError()->message.find("file:///nowhere.mov"), std::string::npos);
  EXPECT_TRUE(capture.controller->hasShutDown());
  EXPECT_FALSE(capture.controller->startRecording());
  EXPECT_TRUE(std::filesystem::is_empty(folder.path()));
}

TEST(Preparing, AnIdentifierOfNoKindIsNamed) {
  const Folder folder;
  Capture capture(folder, "/dev/video0", "test://audio");
  EXPECT_FALSE(capture.prepare());
  EXPECT_NE(capture.controller->lastError()->message.find("zq-device-list"), std::string::npos);
}

TEST(Preparing, ARepositoryThatCannotBeWrittenIsNamed) {
  const Folder folder;
  Capture capture(folder);
  capture.settings.captureTempDir = "/proc/nowhere";
  EXPECT_FALSE(capture.prepare());
  EXPECT_EQ(capture.controller->lastError()->code, kWriteFailed);
}

}  // namespace
}  // namespace lmx

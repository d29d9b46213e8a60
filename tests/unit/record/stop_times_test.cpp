// Deadlines: setting and reaching them, and the auto-shutoff.
#include "record/stop_times.h"

#include "record/auto_shutoff.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

using testing::ScriptedCaptureController;

TimeValue fromNow(int seconds) {
  TimeValue time = *lmp_gettimeofday();
  time.tv_sec += seconds;
  return time;
}

class StopTimes : public EngineTest {
 protected:
  StopTimes() {
    session_->captureController.set(controller_);
    session_->request.set({.uuid = "request"});
    session_->recording_uuid.set("recording");
  }
  std::shared_ptr<ScriptedCaptureController> controller_ =
      std::make_shared<ScriptedCaptureController>(journal_);
};

TEST_F(StopTimes, HardStopCountsFromItsSetting) {
  session_->stop_times.setRecordHardStopTimeSeconds(5430);
  ASSERT_TRUE(session_->stop_times.hardStopTime.get());
  EXPECT_NEAR(static_cast<double>(session_->stop_times.hardStopTime.get()->tv_sec),
              static_cast<double>(lmp_gettimeofday()->tv_sec + 5430), 1.0);
  EXPECT_TRUE(log_.contains(
      6, "hardStopTime set to: " + lmp_timeval_to_ctime(*session_->stop_times.hardStopTime.get())));
  EXPECT_FALSE(session_->stop_times.shouldStopRecording());
}

TEST_F(StopTimes, ZeroOrLessClearsTheHardStop) {
  for (const int seconds : {0, -5}) {
    session_->stop_times.hardStopTime.set(TimeValue{5, 5});
    session_->stop_times.setRecordHardStopTimeSeconds(seconds);
    EXPECT_FALSE(session_->stop_times.hardStopTime.get());
  }
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(StopTimes, SoftStopIsTheUnattendedMinutesFromNow) {
  session_->stop_times.maxUnattendedRecordingMinutes.set(3);
  session_->stop_times.updateSoftStopTime();
  ASSERT_TRUE(session_->stop_times.softStopTime.get());
  EXPECT_NEAR(static_cast<double>(session_->stop_times.softStopTime.get()->tv_sec),
              static_cast<double>(lmp_gettimeofday()->tv_sec + 180), 1.0);
  EXPECT_TRUE(log_.contains(
      6, "unattended stop time set to: " + lmp_timeval_to_ctime(*session_->stop_times.softStopTime.get())));
}

TEST_F(StopTimes, UnattendedLimitOfZeroNeverStops) {
  for (const int minutes : {0, -1}) {
    session_->stop_times.softStopTime.set(TimeValue{5, 5});
    session_->stop_times.maxUnattendedRecordingMinutes.set(minutes);
    session_->stop_times.updateSoftStopTime();
    EXPECT_FALSE(session_->stop_times.softStopTime.get());
    EXPECT_FALSE(session_->stop_times.shouldStopRecording());
  }
}

TEST_F(StopTimes, ContactMovesTheSoftStopOnlyWhileActive) {
  session_->stop_times.maxUnattendedRecordingMinutes.set(1);
  session_->updateLastContact();
  EXPECT_TRUE(session_->lastContact.get());
  EXPECT_FALSE(session_->stop_times.softStopTime.get());
  for (const int status : {1, 2}) {
    session_->status.set(status);
    session_->stop_times.softStopTime.set(TimeValue{5, 5});
    session_->updateLastContact();
    EXPECT_GT(session_->stop_times.softStopTime.get()->tv_sec, 5);
  }
}

TEST_F(StopTimes, HardStopThatHasPassedIsLogged) {
  session_->stop_times.hardStopTime.set(fromNow(-1));
  EXPECT_TRUE(session_->stop_times.shouldStopRecording());
  EXPECT_EQ(log_.entries(),
            (std::vector<testing::LogCapture::Entry>{{kLogNotice, "Agent recording hit hard stop time"}}));
}

TEST_F(StopTimes, SoftStopThatHasPassedIsLoggedWithItsDifference) {
  const TimeValue soft{1000, 0};
  session_->stop_times.softStopTime.set(soft);
  EXPECT_TRUE(session_->stop_times.shouldStopRecording());
  const std::string start = "Agent recording hit soft stop time: " + lmp_timeval_to_ctime(soft) + ", diff: -";
  ASSERT_EQ(log_.entries().size(), 1U);
  EXPECT_EQ(log_.entries()[0].level, 5);
  EXPECT_EQ(log_.entries()[0].text.substr(0, start.size()), start);
}

TEST_F(StopTimes, SoftStopWithinTheSameSecondHasPassed) {
  TimeValue now{};
  do {  // wait until the second isn't about to end
    now = *lmp_gettimeofday();
  } while (now.tv_usec > 900000);
  now.tv_usec = 999999;
  session_->stop_times.softStopTime.set(now);
  EXPECT_TRUE(session_->stop_times.shouldStopRecording());
  session_->stop_times.softStopTime.set(fromNow(2));
  EXPECT_FALSE(session_->stop_times.shouldStopRecording());
}

TEST_F(StopTimes, BothDeadlinesLogBothLines) {
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  session_->stop_times.softStopTime.set(TimeValue{1000, 0});
  EXPECT_TRUE(session_->stop_times.shouldStopRecording());
  EXPECT_TRUE(log_.contains(kLogNotice, "Agent recording hit hard stop time"));
  EXPECT_TRUE(log_.mentions("Agent recording hit soft stop time: "));
}

TEST_F(StopTimes, AutoShutoffMarksTheRequestWaitsAndClearsBothDeadlines) {
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  session_->stop_times.softStopTime.set(fromNow(1000));
  const double before = secondsSinceReferenceDate();
  checkForAutoShutoffConditions(*session_);
  EXPECT_TRUE(log_.contains(kLogNotice, "Doing Auto-Shutoff: Video"));
  EXPECT_EQ(journal_.entries(), (Entries{"setStop", "submitRequest", "stopRecording, waiting"}));
  EXPECT_EQ(controller_->marks()[0].uuid, "request");
  EXPECT_GE(*controller_->marks()[0].time, before);
  EXPECT_LE(*controller_->marks()[0].time, secondsSinceReferenceDate());
  EXPECT_FALSE(session_->stop_times.hardStopTime.get());
  EXPECT_FALSE(session_->stop_times.softStopTime.get());
  checkForAutoShutoffConditions(*session_);
  EXPECT_EQ(journalCount("stopRecording, waiting"), 1);
}

TEST_F(StopTimes, OnlyPassedDeadlinesAreForgotten) {
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  session_->stop_times.softStopTime.set(TimeValue{1000, 0});
  session_->stop_times.clearPassedDeadlines();
  EXPECT_FALSE(session_->stop_times.hardStopTime.get());
  EXPECT_FALSE(session_->stop_times.softStopTime.get());
  session_->stop_times.setRecordHardStopTimeSeconds(3000);
  session_->stop_times.clearPassedDeadlines();
  EXPECT_TRUE(session_->stop_times.hardStopTime.get());
}

TEST_F(StopTimes, DeadlinesFollowAClockThatIsSet) {
  session_->stop_times.maxUnattendedRecordingMinutes.set(1);
  session_->stop_times.updateSoftStopTime();
  session_->stop_times.setRecordHardStopTimeSeconds(60);
  const auto hard = session_->stop_times.hardStopTime.get();
  const auto soft = session_->stop_times.softStopTime.get();
  session_->stop_times.followWallClock(wallClockOffset() - 3600);
  EXPECT_EQ(session_->stop_times.hardStopTime.get()->tv_sec, hard->tv_sec - 3600);
  EXPECT_EQ(session_->stop_times.softStopTime.get()->tv_sec, soft->tv_sec - 3600);
  // The clock moves an hour forward again, which the check must notice by itself.
  EXPECT_FALSE(session_->stop_times.shouldStopRecording());
  EXPECT_NEAR(static_cast<double>(session_->stop_times.hardStopTime.get()->tv_sec),
              static_cast<double>(hard->tv_sec), 1);
  EXPECT_NEAR(static_cast<double>(session_->stop_times.softStopTime.get()->tv_sec),
              static_cast<double>(soft->tv_sec), 1);
  EXPECT_TRUE(log_.waitForPart("The clock was set by"));
}

TEST_F(StopTimes, AutoShutoffLeavesTheDeadlinesOfTheNextRecording) {
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  actions_.on_stop_recording = [this] { session_->stop_times.hardStopTime.set(TimeValue{2000, 0}); };
  doAutoShutoff(*session_, {.request = "request", .hard = TimeValue{1000, 0}, .soft = {}});
  ASSERT_TRUE(session_->stop_times.hardStopTime.get());
  EXPECT_EQ(session_->stop_times.hardStopTime.get()->tv_sec, 2000);
}

/// The thread of one recording may be held up while the main thread stops that and starts the next.
TEST_F(StopTimes, AutoShutoffIsAboutTheRecordingItHasLookedAt) {
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  session_->request.set({.uuid = "looked at"});
  checkForAutoShutoffConditions(*session_);
  EXPECT_EQ(actions_.addressed, std::vector<std::string>{"looked at"});
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  session_->preparing_request.set("being prepared");
  checkForAutoShutoffConditions(*session_);
  EXPECT_EQ(actions_.addressed.back(), "being prepared") << "its deadline may pass while the camera opens";
}

TEST_F(StopTimes, BeginningIsTheStartOrElseThePreparation) {
  EXPECT_FALSE(session_->beginning());
  session_->startTime.set(TimeValue{1000, 0});
  session_->launchTime.set(TimeValue{2000, 0});
  EXPECT_EQ(session_->beginning()->tv_sec, 2000) << "the start is an earlier recording's";
  session_->startTime.set(TimeValue{2001, 0});
  EXPECT_EQ(session_->beginning()->tv_sec, 2001);
}

TEST_F(StopTimes, WithoutADeadlineNothingIsStopped) {
  checkForAutoShutoffConditions(*session_);
  EXPECT_TRUE(journal_.entries().empty());
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(StopTimes, CaptureThreadChecksAtOnce) {
  framework_->on_new_controller = [this](auto& controller) {
    controller.on_start_recording = [this] { session_->stop_times.hardStopTime.set(TimeValue{1000, 0}); };
  };
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("stopRecording, waiting") == 1; }));
  EXPECT_TRUE(session_->autoShutoffCheckTimer.get());
}

TEST_F(StopTimes, CaptureThreadEndsItsTimerWithTheCapture) {
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(testing::waitUntil([&] { return session_->autoShutoffCheckTimer.get(); }));
  endCaptures();
  EXPECT_TRUE(testing::waitUntil([&] { return !session_->autoShutoffCheckTimer.get(); }));
}

#if !defined(__SANITIZE_THREAD__)
TEST_F(StopTimes, AdhocDeadlineEndsTheProcessWithZero) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  context_->options.adhoc.set(true);
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  EXPECT_EXIT(checkForAutoShutoffConditions(*session_), ::testing::ExitedWithCode(0), "");
}
#endif

}  // namespace
}  // namespace lmx

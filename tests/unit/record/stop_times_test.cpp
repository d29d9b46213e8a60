// The deadlines: setting them, hitting them, what the auto-shutoff does.
#include "record/stop_times.h"
#include "support/heap_ptr.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

using testing::ScriptedCaptureController;

std::string text(const TimeValue& time) {
  const heap_ptr<char> line(lmp_timeval_to_ctime(&time));
  return line.get();
}

TimeValue fromNow(int seconds) {
  TimeValue time = *currentTime();
  time.tv_sec += seconds;
  return time;
}

class StopTimes : public EngineTest {
 protected:
  StopTimes() {
    session_->setCaptureController(controller_);
    session_->setRequest_uuid("request");
    session_->setRecording_uuid("recording");
  }
  std::shared_ptr<ScriptedCaptureController> controller_ =
      std::make_shared<ScriptedCaptureController>(journal_);
};

TEST_F(StopTimes, HardStopCountsFromItsSetting) {
  session_->setRecordHardStopTimeSeconds(5430);
  ASSERT_TRUE(session_->hardStopTime());
  EXPECT_NEAR(static_cast<double>(session_->hardStopTime()->tv_sec),
              static_cast<double>(currentTime()->tv_sec + 5430), 1.0);
  EXPECT_TRUE(log_.contains(6, "hardStopTime set to: " + text(*session_->hardStopTime())));
  EXPECT_FALSE(session_->shouldStopRecording());
}

TEST_F(StopTimes, ZeroOrLessClearsTheHardStop) {
  for (const int seconds : {0, -5}) {
    session_->setHardStopTime(TimeValue{5, 5});
    session_->setRecordHardStopTimeSeconds(seconds);
    EXPECT_FALSE(session_->hardStopTime());
  }
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(StopTimes, SoftStopIsTheUnattendedMinutesFromNow) {
  session_->setMaxUnattendedRecordingMinutes(3);
  session_->updateSoftStopTime();
  ASSERT_TRUE(session_->softStopTime());
  EXPECT_NEAR(static_cast<double>(session_->softStopTime()->tv_sec),
              static_cast<double>(currentTime()->tv_sec + 180), 1.0);
  EXPECT_TRUE(log_.contains(6, "unattended stop time set to: " + text(*session_->softStopTime())));
}

TEST_F(StopTimes, UnattendedLimitOfZeroNeverStops) {
  for (const int minutes : {0, -1}) {
    session_->setSoftStopTime(TimeValue{5, 5});
    session_->setMaxUnattendedRecordingMinutes(minutes);
    session_->updateSoftStopTime();
    EXPECT_FALSE(session_->softStopTime());
    EXPECT_FALSE(session_->shouldStopRecording());
  }
}

TEST_F(StopTimes, ContactMovesTheSoftStopOnlyWhileActive) {
  session_->setMaxUnattendedRecordingMinutes(1);
  session_->updateLastContact();
  EXPECT_TRUE(session_->lastContact());
  EXPECT_FALSE(session_->softStopTime());
  for (const int status : {1, 2}) {
    session_->setStatus(status);
    session_->setSoftStopTime(TimeValue{5, 5});
    session_->updateLastContact();
    EXPECT_GT(session_->softStopTime()->tv_sec, 5);
  }
}

TEST_F(StopTimes, HardStopThatHasPassedIsLogged) {
  session_->setHardStopTime(fromNow(-1));
  EXPECT_TRUE(session_->shouldStopRecording());
  EXPECT_EQ(log_.entries(),
            (std::vector<testing::LogCapture::Entry>{{5, "Agent recording hit hard stop time"}}));
}

TEST_F(StopTimes, SoftStopThatHasPassedIsLoggedWithItsDifference) {
  const TimeValue soft{1000, 0};
  session_->setSoftStopTime(soft);
  EXPECT_TRUE(session_->shouldStopRecording());
  const std::string start = "Agent recording hit soft stop time: " + text(soft) + ", diff: -";
  ASSERT_EQ(log_.entries().size(), 1U);
  EXPECT_EQ(log_.entries()[0].level, 5);
  EXPECT_EQ(log_.entries()[0].text.substr(0, start.size()), start);
}

TEST_F(StopTimes, SoftStopWithinTheSameSecondHasPassed) {
  TimeValue now{};
  do {  // away from the end of a second
    now = *currentTime();
  } while (now.tv_usec > 900000);
  now.tv_usec = 999999;
  session_->setSoftStopTime(now);
  EXPECT_TRUE(session_->shouldStopRecording());
  session_->setSoftStopTime(fromNow(2));
  EXPECT_FALSE(session_->shouldStopRecording());
}

TEST_F(StopTimes, BothDeadlinesLogBothLines) {
  session_->setHardStopTime(TimeValue{1000, 0});
  session_->setSoftStopTime(TimeValue{1000, 0});
  EXPECT_TRUE(session_->shouldStopRecording());
  EXPECT_TRUE(log_.contains(5, "Agent recording hit hard stop time"));
  EXPECT_TRUE(log_.mentions("Agent recording hit soft stop time: "));
}

TEST_F(StopTimes, AutoShutoffMarksTheRequestWaitsAndClearsBothDeadlines) {
  session_->setHardStopTime(TimeValue{1000, 0});
  session_->setSoftStopTime(fromNow(1000));
  const double before = secondsSinceReferenceDate();
  session_->checkForAutoShutoffConditions();
  EXPECT_TRUE(log_.contains(5, "Doing Auto-Shutoff: Video"));
  EXPECT_EQ(journal_.entries(), (Entries{"setStop", "stopRecording, waiting"}));
  EXPECT_EQ(controller_->marks()[0].uuid, "request");
  EXPECT_GE(*controller_->marks()[0].time, before);
  EXPECT_LE(*controller_->marks()[0].time, secondsSinceReferenceDate());
  EXPECT_FALSE(session_->hardStopTime());
  EXPECT_FALSE(session_->softStopTime());
  session_->checkForAutoShutoffConditions();
  EXPECT_EQ(journalCount("stopRecording, waiting"), 1);
}

TEST_F(StopTimes, OnlyPassedDeadlinesAreForgotten) {
  session_->setHardStopTime(TimeValue{1000, 0});
  session_->setSoftStopTime(TimeValue{1000, 0});
  session_->clearPassedDeadlines();
  EXPECT_FALSE(session_->hardStopTime());
  EXPECT_FALSE(session_->softStopTime());
  session_->setRecordHardStopTimeSeconds(3000);
  session_->clearPassedDeadlines();
  EXPECT_TRUE(session_->hardStopTime());
}

TEST_F(StopTimes, DeadlinesFollowAClockThatIsSet) {
  session_->setMaxUnattendedRecordingMinutes(1);
  session_->updateSoftStopTime();
  session_->setRecordHardStopTimeSeconds(60);
  const auto hard = session_->hardStopTime();
  const auto soft = session_->softStopTime();
  session_->followWallClock(wallClockOffset() - 3600);
  EXPECT_EQ(session_->hardStopTime()->tv_sec, hard->tv_sec - 3600);
  EXPECT_EQ(session_->softStopTime()->tv_sec, soft->tv_sec - 3600);
  // An hour forward again, which the check itself must notice.
  EXPECT_FALSE(session_->shouldStopRecording());
  EXPECT_NEAR(static_cast<double>(session_->hardStopTime()->tv_sec), static_cast<double>(hard->tv_sec), 1);
  EXPECT_NEAR(static_cast<double>(session_->softStopTime()->tv_sec), static_cast<double>(soft->tv_sec), 1);
  EXPECT_TRUE(log_.waitForPart("The clock was set by"));
}

TEST_F(StopTimes, AutoShutoffLeavesTheDeadlinesOfTheNextRecording) {
  session_->setHardStopTime(TimeValue{1000, 0});
  actions_.on_stop_recording = [this] { session_->setHardStopTime(TimeValue{2000, 0}); };
  session_->doAutoShutoff();
  ASSERT_TRUE(session_->hardStopTime());
  EXPECT_EQ(session_->hardStopTime()->tv_sec, 2000);
}

TEST_F(StopTimes, BeginningIsTheStartOrElseThePreparation) {
  EXPECT_FALSE(session_->beginning());
  session_->setStartTime(TimeValue{1000, 0});
  session_->setLaunchTime(TimeValue{2000, 0});
  EXPECT_EQ(session_->beginning()->tv_sec, 2000) << "the start is an earlier recording's";
  session_->setStartTime(TimeValue{2001, 0});
  EXPECT_EQ(session_->beginning()->tv_sec, 2001);
}

TEST_F(StopTimes, WithoutADeadlineNothingIsStopped) {
  session_->checkForAutoShutoffConditions();
  EXPECT_TRUE(journal_.entries().empty());
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(StopTimes, CaptureThreadChecksAtOnce) {
  framework_->on_new_controller = [this](auto& controller) {
    controller.on_start_recording = [this] { session_->setHardStopTime(TimeValue{1000, 0}); };
  };
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("stopRecording, waiting") == 1; }));
  EXPECT_TRUE(session_->autoShutoffCheckTimer());
}

TEST_F(StopTimes, CaptureThreadEndsItsTimerWithTheCapture) {
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(testing::waitUntil([&] { return session_->autoShutoffCheckTimer(); }));
  endCaptures();
  EXPECT_TRUE(testing::waitUntil([&] { return !session_->autoShutoffCheckTimer(); }));
}

#if !defined(__SANITIZE_THREAD__)
TEST_F(StopTimes, AdhocDeadlineEndsTheProcessWithZero) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  context_->setAdhoc(true);
  session_->setHardStopTime(TimeValue{1000, 0});
  EXPECT_EXIT(session_->checkForAutoShutoffConditions(), ::testing::ExitedWithCode(0), "");
}
#endif

}  // namespace
}  // namespace lmx

// The free-space monitor with a real volume and a controller that deletes as scripted.
#include <gmock/gmock.h>

#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

constexpr std::uint32_t kNeverEnough = 0xFFFFFFFFU;

class DiskSpaceGuardTest : public AgentTest {
 protected:
  DiskSpaceGuardTest() {
    session_->diskSpaceCutoffInMB.set(1);
    agent_.startTimers();
  }
  void setContinuous(bool enabled) {
    LMRContinuousRecordingInfo info;
    info.enabled = enabled;
    context_->recording.continuous.set(info);
  }
  [[nodiscard]] std::ptrdiff_t disabledLines() const {
    std::ptrdiff_t lines = 0;
    for (const auto& entry : log_.entries()) {
      lines += entry.level == kLogWarning && entry.text.ends_with(
                                                 "MB is below threshold 4294967295 MB, unable to free space, "
                                                 "recording disabled");
    }
    return lines;
  }
};

TEST_F(DiskSpaceGuardTest, KeepsRecordingWhileThereIsSpace) {
  start("R1")->devices_run = true;
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(journalCount("controller stopRecording"), 0);
  EXPECT_FALSE(log_.mentions("recording disabled"));
  EXPECT_TRUE(context_->state.running.get());
}

TEST_F(DiskSpaceGuardTest, StopsTheRecordingAndLogsItOnce) {
  const auto controller = start("R1");
  controller->devices_run = true;
  session_->diskSpaceCutoffInMB.set(kNeverEnough);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  controller->devices_run = false;
  agent_.diskSpaceGuard().checkDiskSpace();
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_EQ(disabledLines(), 1);
  reportEnd(controller);
  turnTheLoop();
  EXPECT_NE(nextJob(), nullptr) << "what was recorded until then is submitted";
}

TEST_F(DiskSpaceGuardTest, DoesNotRestartOutsideContinuousMode) {
  session_->diskSpaceCutoffInMB.set(kNeverEnough);
  agent_.diskSpaceGuard().checkDiskSpace();
  session_->diskSpaceCutoffInMB.set(1);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(framework_->controllersMade(), 0U);
}

TEST_F(DiskSpaceGuardTest, RestartsInContinuousMode) {
  setContinuous(true);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(framework_->controllersMade(), 1U);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(framework_->controllersMade(), 1U) << "it runs";
  const auto entries = log_.entries();
  EXPECT_EQ(std::count_if(entries.begin(), entries.end(),
                          [](const auto& e) {
                            return e.level == kLogNotice &&
                                   e.text.ends_with(" MB is sufficient, starting recorder");
                          }),
            1);
  const auto running = framework_->controller(0);
  ASSERT_NE(running, nullptr);
  running->shut_down = true;
  session_->status.set(kRecorderIdle);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(framework_->controllersMade(), 2U);
}

TEST_F(DiskSpaceGuardTest, LogsTheNextShortageAfterSpaceWasAvailable) {
  setContinuous(true);
  session_->diskSpaceCutoffInMB.set(kNeverEnough);
  agent_.diskSpaceGuard().checkDiskSpace();
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(disabledLines(), 1);
  session_->diskSpaceCutoffInMB.set(1);
  agent_.diskSpaceGuard().checkDiskSpace();
  session_->diskSpaceCutoffInMB.set(kNeverEnough);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(disabledLines(), 2);
}

TEST_F(DiskSpaceGuardTest, DeletesSegmentsUntilNothingIsGained) {
  const auto controller = start("R1");
  controller->on_delete_segment = [&]() -> std::optional<std::string> {
    journal_.add("deleteEarliestSegment");
    return std::nullopt;
  };
  session_->diskSpaceCutoffInMB.set(kNeverEnough);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_GE(journalCount("deleteEarliestSegment"), 1);
  EXPECT_LE(journalCount("deleteEarliestSegment"), 5) << "others may use this disk, but not for ever";
}

TEST_F(DiskSpaceGuardTest, TheDirectoryOfTheLastSegmentGoesWithIt) {
  const auto controller = start("R1");
  const std::string full = movie("full");
  const std::string empty = movie("empty");
  std::filesystem::create_directories(full);
  std::filesystem::create_directories(empty);
  testing::writeFile(full + "/2.mov", "segment");
  bool first = true;
  controller->on_delete_segment = [&]() -> std::optional<std::string> {
    const std::string directory = first ? full : empty;
    first = false;
    return directory + "/1.mov";
  };
  session_->diskSpaceCutoffInMB.set(kNeverEnough);
  agent_.diskSpaceGuard().checkDiskSpace();
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_TRUE(std::filesystem::exists(full));
  EXPECT_FALSE(std::filesystem::exists(empty));
}

TEST_F(DiskSpaceGuardTest, AVanishedRepositoryIsMadeAgainAndTheCaptureCancelled) {
  start("R1");
  const std::string lost = movie("below");
  std::filesystem::create_directories(lost);
  context_->recording.recording_repository_path.set(lost);
  session_->filename.set(lost + "/R1.mov");
  std::filesystem::remove_all(lost);
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(journalCount("cancelRecording"), 1);
  EXPECT_TRUE(std::filesystem::is_directory(lost));
  EXPECT_TRUE(context_->state.running.get());
  EXPECT_TRUE(log_.contains(kLogInfo, "Recording Repository does not exist, creating " + lost + "."));
}

TEST_F(DiskSpaceGuardTest, AVolumeThatCannotBeMeasuredEndsTheAgent) {
  const auto controller = start("R1");
  testing::writeFile(movie("file"), "");
  session_->filename.set(movie("file/below/R1.mov"));  // ENOTDIR
  agent_.diskSpaceGuard().checkDiskSpace();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_FALSE(context_->state.running.get());
  context_->state.running.set(true);
}

}  // namespace
}  // namespace lmx

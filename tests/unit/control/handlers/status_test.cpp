// The STATUS command: exact reply texts, profile, audio levels and preview.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <limits>

#include "control/protocol/audio_levels.h"
#include "control/protocol/status_reply.h"
#include "record/agent_record.h"
#include "record/recording_status.h"
#include "tests/unit/control/channel/scripted_channel.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/scripted_capture.h"

namespace lmx {
namespace {

using testing::Journal;
using testing::LogCapture;
using testing::ScriptedActions;
using testing::ScriptedCaptureController;
using testing::ScriptedChannel;

TEST(StatusReply, EveryFieldInItsPlace) {
  RecordStatus status;
  status.recordStatus = 2;
  status.start = 1700000000;
  status.elapsedSeconds = 5000000000;
  status.stop = 1700000100;
  status.hardStop = 1700003000;
  status.lastError = 30;
  status.availableDiskMB = 1023.5;
  status.totalDiskMB = 2048.4;
  EXPECT_EQ(statusFields(6, status),
            "cmdStatus=6,recordStatus=2,start=1700000000,elapsedTime=5000000000,stop=1700000100,"
            "hard_stop=1700003000,lastError=30,availDiskInMB=1024,totalDiskInMB=2048");
}

TEST(StatusReply, ProfileOfWhatIsSet) {
  EXPECT_EQ(profileFields("Hall 3", "tunnel.example", "Video:Good"),
            "CameraName=Hall 3,TunnelHost=tunnel.example,RecordingCapturePreset=Video:Good");
  EXPECT_EQ(profileFields("Hall 3", "tunnel.example", std::nullopt),
            "CameraName=Hall 3,TunnelHost=tunnel.example,RecordingCapturePreset=");
}

TEST(StatusReply, PreviewCarriesLevelsSizeAndImage) {
  EXPECT_EQ(previewFields({20.0F, 10.0F}, "QUJD"),
            "audio-level-left=20.000000,audio-level-right=10.000000,preview-size=4,preview=QUJD");
}

TEST(AudioLevels, NoChannelsReadZero) {
  EXPECT_EQ(audioLevels({}).left, 0.0F);
  EXPECT_EQ(audioLevels({}).right, 0.0F);
}

TEST(AudioLevels, OneChannelAtMinusSixDecibelsReadsOnBothSides) {
  const AudioLevels levels = audioLevels({-6.0});
  EXPECT_NEAR(levels.left, 10.02, 0.005);
  EXPECT_EQ(levels.right, levels.left);
}

TEST(AudioLevels, FirstTwoChannelsAreLeftAndRight) {
  const AudioLevels levels = audioLevels({0.0, -20.0, -40.0});
  EXPECT_FLOAT_EQ(levels.left, 20.0F);
  EXPECT_FLOAT_EQ(levels.right, 2.0F);
}

TEST(AudioLevels, SilenceReadsZero) {
  EXPECT_EQ(audioLevels({-std::numeric_limits<double>::infinity()}).left, 0.0F);
}

/// A preview image on disk that goes with the test.
class TemporaryFile {
 public:
  explicit TemporaryFile(const std::string& content) {
    const int fd = ::mkstemp(path_.data());
    std::ofstream(path_, std::ios::binary) << content;
    ::close(fd);
  }
  ~TemporaryFile() { ::unlink(path_.c_str()); }
  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;
  [[nodiscard]] const std::string& path() const { return path_; }

 private:
  std::string path_ = "/tmp/unit_control_XXXXXX";
};

class StatusCommand : public ::testing::Test {
 protected:
  StatusCommand() {
    session_->captureController.set(capture_);
    session_->filename.set("/tmp/lecture.mov");
    session_->recordingType.set(kRecordingTypeAudioVideo);
    context_->server.machine_name.set("Hall 3");
    context_->server.tunnel_host.set("tunnel.example");
    context_->recording.capture_preset.set("Video:Good");
  }
  std::string reply(const std::string& line) {
    channel_.receive(line + "\n");
    const auto replies = channel_.replies();
    return replies.empty() ? "(none)" : replies.back();
  }

  const std::string plain_ =
      "cmdStatus=0,recordStatus=0,start=0,elapsedTime=0,stop=0,hard_stop=0,lastError=0,"
      "availDiskInMB=[0-9]+,totalDiskInMB=[0-9]+";
  LogCapture log_;
  Journal journal_;
  ScriptedActions actions_{journal_};
  std::shared_ptr<ScriptedCaptureController> capture_ = std::make_shared<ScriptedCaptureController>(journal_);
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::shared_ptr<AgentRecord> session_ = context_->record_context();
  ScriptedChannel channel_{context_, &actions_};
};

TEST_F(StatusCommand, WithoutSessionAnswersTwoAndZeroes) {
  context_->releaseRecord();
  EXPECT_EQ(reply("STATUS"),
            "cmdStatus=2,recordStatus=0,start=0,elapsedTime=0,stop=0,hard_stop=0,lastError=0,"
            "availDiskInMB=0,totalDiskInMB=0");
}

TEST_F(StatusCommand, IdleSession) {
  EXPECT_THAT(reply("STATUS"), ::testing::MatchesRegex(plain_)) << channel_.replies().back();
}

TEST_F(StatusCommand, RunningRecordingIsReported) {
  capture_->state = 3;
  capture_->elapsed_milliseconds = 61999;
  session_->launchTime.set(TimeValue{1700000000, 999999});
  session_->stop_times.hardStopTime.set(TimeValue{1700003000, 0});
  session_->error.set(30);
  EXPECT_TRUE(
      reply("STATUS").starts_with("cmdStatus=0,recordStatus=2,start=1700000000,elapsedTime=61,stop=0,"
                                  "hard_stop=1700003000,lastError=30,availDiskInMB="))
      << channel_.replies().back();
}

TEST_F(StatusCommand, PausedRecordingReadsOne) {
  capture_->state = 4;
  EXPECT_TRUE(reply("STATUS").starts_with("cmdStatus=0,recordStatus=1,")) << channel_.replies().back();
}

TEST_F(StatusCommand, ProfileFollowsOnlyTheExactTextTrue) {
  const std::string profile =
      ",CameraName=Hall 3,TunnelHost=tunnel.example,RecordingCapturePreset=Video:Good";
  EXPECT_TRUE(reply("STATUS include_profile=true").ends_with(profile));
  for (const char* other :
       {"STATUS include_profile=TRUE", "STATUS include_profile=1", "STATUS include_profile"}) {
    EXPECT_THAT(reply(other), ::testing::MatchesRegex(plain_)) << other;
  }
}

TEST_F(StatusCommand, PreviewFileOfARunningRecording) {
  const TemporaryFile image("JPEG!");
  context_->recording.preview_file.set(image.path());
  capture_->state = 3;
  capture_->power_levels = {0.0, -20.0};
  EXPECT_TRUE(reply("STATUS include_preview=true,include_profile=true")
                  .ends_with(",RecordingCapturePreset=Video:Good,audio-level-left=20.000000,"
                             "audio-level-right=2.000000,preview-size=8,preview=SlBFRyE="))
      << channel_.replies().back();
}

TEST_F(StatusCommand, PreviewFileOfAnIdleRecorderHasNoLevels) {
  const TemporaryFile image("JPEG!");
  context_->recording.preview_file.set(image.path());
  capture_->power_levels = {0.0};
  EXPECT_TRUE(reply("STATUS include_preview=true")
                  .ends_with(",audio-level-left=0.000000,audio-level-right=0.000000,preview-size=8,"
                             "preview=SlBFRyE="));
}

TEST_F(StatusCommand, PreviewFileThatHoldsNothingGivesNoPreview) {
  const TemporaryFile empty("");
  for (const std::string& path :
       {empty.path(), std::string("/tmp/unit_control/absent.jpg"), std::string("/tmp")}) {
    context_->recording.preview_file.set(path);
    EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_)) << path;
  }
  EXPECT_EQ(log_.count(7, "preview buffer is NULL"), 3);
}

TEST_F(StatusCommand, PreviewFileTooLargeForAStillGivesNoPreview) {
  const TemporaryFile movie("JPEG!");
  std::filesystem::resize_file(movie.path(), (16U << 20) + 1);
  context_->recording.preview_file.set(movie.path());
  EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_));
}

TEST_F(StatusCommand, PreviewFileOfAnAudioOnlySessionIsStillSent) {
  const TemporaryFile image("JPEG!");
  context_->recording.preview_file.set(image.path());
  session_->recordingType.set(kRecordingTypeAudio);
  EXPECT_TRUE(reply("STATUS include_preview=true").ends_with(",preview-size=8,preview=SlBFRyE="));
}

TEST_F(StatusCommand, AudioOnlySessionHasNoPreviewAndNoLineAboutIt) {
  session_->recordingType.set(kRecordingTypeAudio);
  EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_));
  EXPECT_FALSE(log_.mentions("preview buffer is NULL"));
}

TEST_F(StatusCommand, VideoSessionWithoutPreviewSaysSoInTheLog) {
  session_->recordingType.set(kRecordingTypeVideo);
  EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_));
  EXPECT_TRUE(log_.contains(7, "preview buffer is NULL"));
}

TEST_F(StatusCommand, AfterTheChannelHasStoppedItselfNothingIsAnswered) {
  channel_.stop();
  EXPECT_EQ(reply("STATUS"), "(none)");
  EXPECT_TRUE(log_.contains(3, "No agent context"));
}

}  // namespace
}  // namespace lmx

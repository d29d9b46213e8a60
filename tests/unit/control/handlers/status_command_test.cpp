// The STATUS command: exact reply texts, profile, audio levels and preview.
#include "control/handlers/status_command.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "control/protocol/command_parser.h"
#include "record/agent_record.h"
#include "tests/unit/control/handlers/collected_replies.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_capture.h"

namespace lmx {
namespace {

using testing::CollectedReplies;
using testing::Journal;
using testing::LogCapture;
using testing::ScriptedCaptureController;

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

class StatusCommandTest : public ::testing::Test {
 protected:
  StatusCommandTest() {
    session_->captureController.set(capture_);
    session_->filename.set("/tmp/lecture.mov");
    session_->recordingType.set(kRecordingTypeAudioVideo);
    context_->server.machine_name.set("Hall 3");
    context_->server.tunnel_host.set("tunnel.example");
    context_->recording.capture_preset.set("Video:Good");
  }
  std::string reply(const std::string& line) {
    const Command command = parseCommand(line);
    status_.handleSTATUS(command.parameters ? &*command.parameters : nullptr);
    return replies_.last();
  }

  const std::string plain_ =
      "cmdStatus=0,recordStatus=0,start=0,elapsedTime=0,stop=0,hard_stop=0,lastError=0,"
      "availDiskInMB=[0-9]+,totalDiskInMB=[0-9]+";
  LogCapture log_;
  Journal journal_;
  std::shared_ptr<ScriptedCaptureController> capture_ = std::make_shared<ScriptedCaptureController>(journal_);
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::shared_ptr<AgentRecord> session_ = context_->record_context();
  ChannelContext held_{context_};
  CollectedReplies replies_;
  StatusCommand status_{held_, replies_};
};

TEST_F(StatusCommandTest, WithoutSessionAnswersTwoAndZeroes) {
  context_->releaseRecord();
  EXPECT_EQ(reply("STATUS"),
            "cmdStatus=2,recordStatus=0,start=0,elapsedTime=0,stop=0,hard_stop=0,lastError=0,"
            "availDiskInMB=0,totalDiskInMB=0");
}

TEST_F(StatusCommandTest, IdleSession) {
  EXPECT_THAT(reply("STATUS"), ::testing::MatchesRegex(plain_)) << replies_.last();
}

TEST_F(StatusCommandTest, RunningRecordingIsReported) {
  capture_->state = 3;
  capture_->elapsed_milliseconds = 61999;
  session_->launchTime.set(TimeValue{1700000000, 999999});
  session_->stop_times.hardStopTime.set(TimeValue{1700003000, 0});
  session_->error.set(30);
  EXPECT_TRUE(
      reply("STATUS").starts_with("cmdStatus=0,recordStatus=2,start=1700000000,elapsedTime=61,stop=0,"
                                  "hard_stop=1700003000,lastError=30,availDiskInMB="))
      << replies_.last();
}

TEST_F(StatusCommandTest, PausedRecordingReadsOne) {
  capture_->state = 4;
  EXPECT_TRUE(reply("STATUS").starts_with("cmdStatus=0,recordStatus=1,")) << replies_.last();
}

TEST_F(StatusCommandTest, ProfileFollowsOnlyTheExactTextTrue) {
  const std::string profile =
      ",CameraName=Hall 3,TunnelHost=tunnel.example,RecordingCapturePreset=Video:Good";
  EXPECT_TRUE(reply("STATUS include_profile=true").ends_with(profile));
  for (const char* other :
       {"STATUS include_profile=TRUE", "STATUS include_profile=1", "STATUS include_profile"}) {
    EXPECT_THAT(reply(other), ::testing::MatchesRegex(plain_)) << other;
  }
}

TEST_F(StatusCommandTest, PreviewFileOfARunningRecording) {
  const TemporaryFile image("JPEG!");
  context_->recording.preview_file.set(image.path());
  capture_->state = 3;
  capture_->power_levels = {0.0, -20.0};
  EXPECT_TRUE(reply("STATUS include_preview=true,include_profile=true")
                  .ends_with(",RecordingCapturePreset=Video:Good,audio-level-left=20.000000,"
                             "audio-level-right=2.000000,preview-size=8,preview=SlBFRyE="))
      << replies_.last();
}

TEST_F(StatusCommandTest, PreviewFileOfAnIdleRecorderHasNoLevels) {
  const TemporaryFile image("JPEG!");
  context_->recording.preview_file.set(image.path());
  capture_->power_levels = {0.0};
  EXPECT_TRUE(reply("STATUS include_preview=true")
                  .ends_with(",audio-level-left=0.000000,audio-level-right=0.000000,preview-size=8,"
                             "preview=SlBFRyE="));
}

TEST_F(StatusCommandTest, PreviewFileThatHoldsNothingGivesNoPreview) {
  const TemporaryFile empty("");
  for (const std::string& path :
       {empty.path(), std::string("/tmp/unit_control/absent.jpg"), std::string("/tmp")}) {
    context_->recording.preview_file.set(path);
    EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_)) << path;
  }
  EXPECT_EQ(log_.count(kLogDebug, "preview buffer is NULL"), 3);
}

TEST_F(StatusCommandTest, PreviewFileTooLargeForAStillGivesNoPreview) {
  const TemporaryFile movie("JPEG!");
  std::filesystem::resize_file(movie.path(), (16U << 20) + 1);
  context_->recording.preview_file.set(movie.path());
  EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_));
}

TEST_F(StatusCommandTest, PreviewFileOfAnAudioOnlySessionIsStillSent) {
  const TemporaryFile image("JPEG!");
  context_->recording.preview_file.set(image.path());
  session_->recordingType.set(kRecordingTypeAudio);
  EXPECT_TRUE(reply("STATUS include_preview=true").ends_with(",preview-size=8,preview=SlBFRyE="));
}

TEST_F(StatusCommandTest, AudioOnlySessionHasNoPreviewAndNoLineAboutIt) {
  session_->recordingType.set(kRecordingTypeAudio);
  EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_));
  EXPECT_FALSE(log_.mentions("preview buffer is NULL"));
}

TEST_F(StatusCommandTest, VideoSessionWithoutPreviewSaysSoInTheLog) {
  session_->recordingType.set(kRecordingTypeVideo);
  EXPECT_THAT(reply("STATUS include_preview=true"), ::testing::MatchesRegex(plain_));
  EXPECT_TRUE(log_.contains(kLogDebug, "preview buffer is NULL"));
}

TEST_F(StatusCommandTest, AfterTheChannelHasStoppedItselfNothingIsAnswered) {
  held_.release();
  EXPECT_EQ(reply("STATUS"), "(none)");
  EXPECT_TRUE(log_.contains(kLogError, "No agent context"));
}

}  // namespace
}  // namespace lmx

// The texts of the STATUS reply.
#include "control/handlers/status_reply.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

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

}  // namespace
}  // namespace lmx

// Which encoder is taken, and what follows when it is too slow. No hardware is needed: the kinds are data.
#include "capture/gst/video_encoders.h"

#include <gtest/gtest.h>

#include "capture/gst/gst_handles.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::LogCapture;

VideoEncoderKind kind(const std::string& name, const std::string& elements) {
  return {name, [elements](const VideoEncoding&) { return elements; }};
}

VideoEncoding chosen(const VideoEncoderChoice& choice, RecordingQuality quality = RecordingQuality::better) {
  VideoEncoding video{.size = {640, 360}, .frameRate = {30, 1}, .quality = quality};
  choice.apply(video);
  return video;
}

TEST(VideoEncoders, TheFirstThatWorksIsTaken) {
  ensureGStreamer();
  LogCapture log;
  VideoEncoderChoice choice;
  EXPECT_EQ(chosen(choice).kind.name, "x264enc") << "before anything has been tried";
  choice.tryOut({kind("absent", "nosuchencoder bitrate=1"),
                 kind("failing", "identity error-after=3 ! x264enc"),
                 kind("reordering", "x264enc bframes=2 b-adapt=false"),
                 kind("silent", "x264enc ! identity drop-probability=1"),
                 kind("deaf", "identity drop-buffer-flags=none ! x264enc tune=zerolatency key-int-max=1"),
                 kind("good", "x264enc tune=zerolatency"), kind("better", "x264enc tune=zerolatency")});
  EXPECT_EQ(chosen(choice).kind.name, "good");
  EXPECT_EQ(log.count(kLogInfo, "Pictures are encoded with good"), 1);
  for (const char* refused : {"absent", "failing", "reordering", "silent", "deaf"}) {
    EXPECT_TRUE(log.mentions("Pictures are not encoded with " + std::string(refused) + ": ")) << refused;
  }
}

TEST(VideoEncoders, WhereNoneWorksItIsSaid) {
  LogCapture log;
  VideoEncoderChoice choice;
  choice.tryOut({kind("absent", "nosuchencoder")});
  EXPECT_EQ(log.count(kLogError, "No encoder for pictures works: recordings will fail"), 1);
  EXPECT_EQ(chosen(choice).kind.name, "x264enc");
}

TEST(VideoEncoders, TheLastOneKnownIsTheOneThatWorksEverywhere) {
  EXPECT_EQ(knownVideoEncoders().back().name, "x264enc");
  EXPECT_FALSE(tryVideoEncoder(knownVideoEncoders().back()));
}

TEST(VideoEncoders, OneThatFallsBehindHasLessToDoNextTime) {
  LogCapture log;
  VideoEncoderChoice choice;
  for (const auto& [now, next] : std::vector<std::pair<std::string, std::string>>{
           {"x264enc veryfast", "x264enc superfast"}, {"x264enc superfast", "x264enc ultrafast"}}) {
    EXPECT_EQ(describeEncoder(chosen(choice)), now);
    choice.fellBehind(chosen(choice));
    EXPECT_EQ(describeEncoder(chosen(choice)), next);
    EXPECT_EQ(log.count(kLogNotice, "The encoder could not keep up with " + now +
                                        ": the next recording is encoded with " + next),
              1);
  }
  const auto said = log.entries().size();
  choice.fellBehind(chosen(choice));
  EXPECT_EQ(describeEncoder(chosen(choice)), "x264enc ultrafast");
  EXPECT_EQ(log.entries().size(), said) << "there is nothing cheaper";
}

TEST(VideoEncoders, HardwareThatFallsBehindIsNotTakenAgain) {
  ensureGStreamer();
  VideoEncoderChoice choice;
  choice.tryOut({kind("hardware", "x264enc tune=zerolatency")});
  choice.fellBehind(chosen(choice));
  EXPECT_EQ(describeEncoder(chosen(choice)), "x264enc veryfast");
}

TEST(VideoEncoders, HardwareThatFailsInARecordingIsNotTakenAgain) {
  ensureGStreamer();
  LogCapture log;
  VideoEncoderChoice choice;
  choice.tryOut({kind("hardware", "x264enc tune=zerolatency")});
  choice.failed(chosen(choice));
  choice.failed(chosen(choice));
  EXPECT_EQ(chosen(choice).kind.name, "x264enc");
  EXPECT_EQ(log.count(kLogWarning, "hardware has failed: the next recordings are encoded with x264enc"), 1);
}

}  // namespace
}  // namespace lmx

// A recorder whose camera is played by the test.
#include "capture/capture_recorder.h"

#include <gtest/gtest.h>

#include <cmath>
#include <future>

#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Capture;
using testing::Folder;
using testing::LogCapture;

constexpr double kFrame = 1.0 / 30.0;

/// A recorder with a camera of "speed=max" that is never started: all its pictures come from here.
class Hall {
 public:
  Hall() {
    ensureGStreamer();
    const Capture capture(folder_, "test://video?size=160x90&speed=max", "");
    recorder_ = *CaptureRecorder::open(*planRecording(capture.settings));
    recorder_->marks().start("R", 0, nullptr);
    const auto ended = std::make_shared<std::promise<CaptureRecorder::Outcome>>();
    outcome_ = ended->get_future();
    const auto report = [ended](const CaptureRecorder::Outcome& outcome) { ended->set_value(outcome); };
    EXPECT_FALSE(recorder_->run([report] { return report; }, nullptr));
  }
  void pictures(double from, double to, bool readable) {
    const CapsHandle caps(
        gst_caps_from_string(readable ? "video/x-raw,format=I420,width=160,height=90,framerate=30/1"
                                      : "video/x-raw,format=ENCODED,width=160,height=90"));
    for (int i = 0; i < std::lround((to - from) / kFrame); ++i) {
      const BufferHandle buffer(gst_buffer_new_allocate(nullptr, gsize{160} * 90 * 3 / 2, nullptr));
      recorder_->onPicture(SampleHandle(gst_sample_new(buffer.get(), caps.get(), nullptr, nullptr)),
                           from + i * kFrame);
    }
  }
  CaptureRecorder& operator*() { return *recorder_; }
  CaptureRecorder::Outcome outcome() {
    EXPECT_EQ(outcome_.wait_for(30s), std::future_status::ready);
    return outcome_.get();
  }

 private:
  Folder folder_;
  std::shared_ptr<CaptureRecorder> recorder_;
  std::future<CaptureRecorder::Outcome> outcome_;
};

TEST(CaptureRecorder, PicturesThatCanNotBeReadEndTheRecordingAfterTenSeconds) {
  LogCapture log;
  Hall hall;
  hall.pictures(0, 2, true);
  hall.pictures(2, 14, false);
  const auto outcome = hall.outcome();
  ASSERT_TRUE(outcome.error);
  EXPECT_EQ(outcome.error->code, kDeviceFailed);
  EXPECT_TRUE(log.mentions("The camera's pictures can't be read: "));
  EXPECT_FALSE(log.mentions("it is fitted into")) << "nothing is";
  EXPECT_TRUE(log.mentions("frames lost, from 0:00:02 on"));
  EXPECT_GE((*hall).recordedMilliseconds(), 12000);
  EXPECT_LE((*hall).recordedMilliseconds(), 14000);
}

TEST(CaptureRecorder, PicturesThatCanBeReadAgainAreTold) {
  LogCapture log;
  Hall hall;
  (*hall).marks().stop("R", 4.5);
  hall.pictures(0, 1, true);
  hall.pictures(1, 4, false);
  hall.pictures(4, 5, true);
  (*hall).end(CaptureRecorder::Ending::stop);
  EXPECT_FALSE(hall.outcome().error);
  EXPECT_EQ(log.count(kLogNotice, "The camera's pictures can be read again after 3 s"), 1);
  EXPECT_TRUE(log.mentions("90 frames lost, from 0:00:01 on"));
  EXPECT_EQ((*hall).recordedMilliseconds(), 4500);
}

}  // namespace
}  // namespace lmx

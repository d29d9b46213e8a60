// Who is told what, and how often.
#include "capture/source/capture_consumers.h"

#include <gtest/gtest.h>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

class Consumer : public CaptureConsumer {
 public:
  void onVideo(BufferHandle, double runningTime) override { video.push_back(runningTime); }
  void onAudio(BufferHandle, double runningTime) override { audio.push_back(runningTime); }
  void onCaptureError(const CaptureError& error) override { errors.push_back(error.code); }
  std::vector<double> video;
  std::vector<double> audio;
  std::vector<int> errors;
};

CaptureError error(int code) { return {CaptureError::kDomain, code, "gone"}; }

TEST(CaptureConsumers, GetWhatComesUntilTheyAreRemoved) {
  ensureGStreamer();
  const BufferHandle buffer(gst_buffer_new());
  CaptureConsumers consumers;
  const auto consumer = std::make_shared<Consumer>();
  consumers.add(consumer);
  consumers.deliver(CaptureConsumers::Medium::video, buffer.get(), 1);
  consumers.deliver(CaptureConsumers::Medium::audio, buffer.get(), 2);
  consumers.remove(consumer.get());
  consumers.deliver(CaptureConsumers::Medium::video, buffer.get(), 3);
  EXPECT_EQ(consumer->video, std::vector<double>{1});
  EXPECT_EQ(consumer->audio, std::vector<double>{2});
}

TEST(CaptureConsumers, OnlyTheFirstErrorIsTold) {
  const testing::LogCapture log;
  CaptureConsumers consumers;
  const auto consumer = std::make_shared<Consumer>();
  consumers.add(consumer);
  consumers.fail(error(kDeviceFailed));
  consumers.fail(error(kStreamEnded));
  EXPECT_EQ(consumer->errors, std::vector<int>{kDeviceFailed});
  EXPECT_EQ(consumers.failure()->code, kDeviceFailed);
}

TEST(CaptureConsumers, WhoComesAfterTheErrorIsToldToo) {
  const testing::LogCapture log;
  CaptureConsumers consumers;
  consumers.fail(error(kDeviceFailed));
  const auto late = std::make_shared<Consumer>();
  consumers.add(late);
  EXPECT_EQ(late->errors, std::vector<int>{kDeviceFailed});
}

}  // namespace
}  // namespace lmx

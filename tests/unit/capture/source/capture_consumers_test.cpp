// Who is told what, and how often.
#include "capture/source/capture_consumers.h"

#include <gtest/gtest.h>

#include <chrono>
#include <future>
#include <thread>

namespace lmx {
namespace {

class Consumer : public CaptureConsumer {
 public:
  void onPicture(SampleHandle, double time) override { pictures.push_back(time); }
  void onSound(BufferHandle, double time) override { sounds.push_back(time); }
  void onSourceLost(SourceUse, const CaptureError& error) override { lost.push_back(error.code); }
  void onSourceAway(SourceUse, const CaptureError& error) override { away.push_back(error.code); }
  void onSourceBack(SourceUse, double seconds) override { back.push_back(seconds); }
  std::vector<double> pictures;
  std::vector<double> sounds;
  std::vector<int> lost;
  std::vector<int> away;
  std::vector<double> back;
};

constexpr SourceUse kBoth{.picture = true, .sound = true};

CaptureError error(int code) { return {CaptureError::kDomain, code, "gone"}; }

TEST(CaptureConsumers, GetWhatTheyUseUntilTheyAreRemoved) {
  ensureGStreamer();
  const BufferHandle buffer(gst_buffer_new());
  const SampleHandle sample(gst_sample_new(buffer.get(), nullptr, nullptr, nullptr));
  CaptureConsumers consumers;
  const auto both = std::make_shared<Consumer>();
  const auto listener = std::make_shared<Consumer>();
  consumers.add(both, kBoth);
  consumers.add(listener, {.picture = false, .sound = true});
  consumers.deliverPicture(sample.get(), 1);
  consumers.deliverSound(buffer.get(), 2);
  consumers.remove(both.get());
  consumers.deliverPicture(sample.get(), 3);
  EXPECT_EQ(both->pictures, std::vector<double>{1});
  EXPECT_EQ(both->sounds, std::vector<double>{2});
  EXPECT_TRUE(listener->pictures.empty());
  EXPECT_EQ(listener->sounds, std::vector<double>{2});
}

TEST(CaptureConsumers, OnlyTheFirstLossIsTold) {
  CaptureConsumers consumers;
  const auto consumer = std::make_shared<Consumer>();
  consumers.add(consumer, kBoth);
  consumers.lost(error(kDeviceFailed));
  consumers.lost(error(kStreamEnded));
  EXPECT_EQ(consumer->lost, std::vector<int>{kDeviceFailed});
  EXPECT_EQ(consumers.failure()->code, kDeviceFailed);
}

TEST(CaptureConsumers, WhoComesAfterTheLossIsToldToo) {
  CaptureConsumers consumers;
  consumers.lost(error(kDeviceFailed));
  const auto late = std::make_shared<Consumer>();
  consumers.add(late, kBoth);
  EXPECT_EQ(late->lost, std::vector<int>{kDeviceFailed});
}

TEST(CaptureConsumers, AbsenceAndReturnAlternate) {
  CaptureConsumers consumers;
  const auto consumer = std::make_shared<Consumer>();
  consumers.add(consumer, kBoth);
  consumers.back(1);  // it was not away
  consumers.away(error(kAudioSilent));
  consumers.away(error(kAudioSilent));
  const auto late = std::make_shared<Consumer>();
  consumers.add(late, kBoth);
  consumers.back(3);
  EXPECT_EQ(consumer->away, std::vector<int>{kAudioSilent});
  EXPECT_EQ(consumer->back, std::vector<double>{3});
  EXPECT_EQ(late->away, std::vector<int>{kAudioSilent}) << "who comes meanwhile is told";
  EXPECT_EQ(late->back, std::vector<double>{3});
}

/// Is told of the absence while it is being added, and takes its time: the return must come behind.
class SlowConsumer : public Consumer {
 public:
  void onSourceAway(SourceUse use, const CaptureError& error) override {
    entered.set_value();
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    Consumer::onSourceAway(use, error);
    order += "away ";
  }
  void onSourceBack(SourceUse, double) override { order += "back "; }
  std::promise<void> entered;
  std::string order;
};

TEST(CaptureConsumers, NobodyHearsOfTheReturnBeforeTheAbsence) {
  CaptureConsumers consumers;
  consumers.away(error(kAudioSilent));
  const auto slow = std::make_shared<SlowConsumer>();
  auto entered = slow->entered.get_future();
  std::thread adds([&] { consumers.add(slow, kBoth); });
  entered.wait();
  consumers.back(1);
  adds.join();
  EXPECT_EQ(slow->order, "away back ");
}

TEST(CaptureConsumers, WhoWantsNoSoundIsNotToldThatThereIsNone) {
  CaptureConsumers consumers;
  const auto both = std::make_shared<Consumer>();
  const auto viewer = std::make_shared<Consumer>();
  consumers.add(both, kBoth);
  consumers.add(viewer, {.picture = true, .sound = false});
  consumers.noSound(error(kAudioSilent));
  consumers.noSound(error(kAudioSilent));
  const auto late = std::make_shared<Consumer>();
  consumers.add(late, kBoth);
  EXPECT_EQ(both->away, std::vector<int>{kAudioSilent});
  EXPECT_EQ(late->away, std::vector<int>{kAudioSilent});
  EXPECT_TRUE(viewer->away.empty());
}

}  // namespace
}  // namespace lmx

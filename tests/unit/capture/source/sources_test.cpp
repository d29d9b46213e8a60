// The life of a source, and who shares it.
#include "capture/source/sources.h"

#include <gtest/gtest.h>

#include <condition_variable>
#include <future>
#include <thread>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

constexpr auto kPatience = 20s;

SourceWish camera(const std::string& device) { return {.device = device, .picture = true, .demand = {}}; }
SourceWish microphone(const std::string& device) {
  return {.device = device, .picture = false, .demand = {}};
}

/// Counts what comes and lets a test wait for it.
class Counter : public CaptureConsumer {
 public:
  struct Counts {
    int pictures = 0;
    int sounds = 0;
    int lost = 0;
    int away = 0;
    int back = 0;
    int code = 0;  ///< of the last loss or absence
    double lastSound = 0;
  };
  void onPicture(SampleHandle, double) override {
    change([](Counts& c) { ++c.pictures; });
  }
  void onSound(BufferHandle sound, double time) override {
    const auto bytes = gst_buffer_get_size(sound.get());
    change([&](Counts& c) {
      ++c.sounds;
      c.lastSound = time + static_cast<double>(bytes) / (sizeof(float) * kSoundChannels) / kSoundRate;
    });
  }
  void onSourceLost(SourceUse, const CaptureError& error) override {
    change([&](Counts& c) { ++c.lost, c.code = error.code; });
  }
  void onSourceAway(SourceUse, const CaptureError& error) override {
    change([&](Counts& c) { ++c.away, c.code = error.code; });
  }
  void onSourceBack(SourceUse, double) override {
    change([](Counts& c) { ++c.back; });
  }
  template <class Condition>
  bool wait(Condition condition) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, kPatience, [&] { return condition(counts_); });
  }
  Counts counts() {
    const std::lock_guard lock(mutex_);
    return counts_;
  }

 private:
  template <class Change>
  void change(Change change) {
    const std::lock_guard lock(mutex_);
    change(counts_);
    changed_.notify_all();
  }
  std::mutex mutex_;
  std::condition_variable changed_;
  Counts counts_;
};

TEST(Sources, ADeviceIsOpenedOnceWhateverIsWantedOfIt) {
  const std::string device = "test://video?size=160x90";
  SourceWish other = camera(device);
  other.demand.maximumRate = 15;
  const auto first = Sources::instance().lease(camera(device));
  const auto second = Sources::instance().lease(other);
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->get(), second->get());
  EXPECT_FALSE((*first)->waitUntilRunning(kPatience));
  EXPECT_TRUE(Sources::instance().delivers(device));
}

TEST(Sources, TheLastLeaseClosesTheDevice) {
  const std::string device = "test://video?size=160x92";
  auto lease = Sources::instance().lease(camera(device));
  ASSERT_TRUE(lease);
  ASSERT_FALSE((*lease)->waitUntilRunning(kPatience));
  const SourceLease second = *Sources::instance().lease(camera(device));
  *lease = nullptr;
  EXPECT_TRUE(second->isRunning());
}

TEST(Source, TellsWhatItGives) {
  const auto lease = *Sources::instance().lease(camera("test://video?size=320x180&rate=25"));
  ASSERT_FALSE(lease->waitUntilRunning(kPatience));
  EXPECT_EQ(lease->format().size.width, 320);
  EXPECT_EQ(lease->format().size.height, 180);
  EXPECT_EQ(lease->format().rate, (FrameRate{25, 1}));
}

/// The change to "playing" waits for a sample that is on its way, and that sample for the source.
TEST(Source, AFastDeviceMayBeStartedWhileItsFirstSampleIsMade) {
  for (int i = 0; i < 200; ++i) {
    const auto lease = *Sources::instance().lease(camera("test://video?size=64x64&speed=max"));
    const auto counter = std::make_shared<Counter>();
    lease->consumers().add(counter, {.picture = true, .sound = false});
    ASSERT_FALSE(lease->waitUntilRunning(kPatience));
    auto started = std::async(std::launch::async, [&] { lease->start(); });
    ASSERT_EQ(started.wait_for(kPatience), std::future_status::ready) << "try " << i;
    ASSERT_TRUE(counter->wait([](const auto& c) { return c.pictures > 0; })) << "try " << i;
  }
}

TEST(Source, ACameraThatFailsIsLostForGood) {
  testing::LogCapture log;
  const auto lease = *Sources::instance().lease(camera("test://video?size=160x90&lost-after=0.2"));
  const auto counter = std::make_shared<Counter>();
  lease->consumers().add(counter, {.picture = true, .sound = false});
  ASSERT_TRUE(counter->wait([](const auto& c) { return c.lost == 1; }));
  EXPECT_EQ(counter->counts().code, kDeviceNotFound);
  EXPECT_FALSE(lease->isRunning());
  ASSERT_TRUE(lease->waitUntilRunning(kPatience));
  EXPECT_EQ(lease->waitUntilRunning(kPatience)->code, kDeviceNotFound);
  EXPECT_TRUE(log.waitForPart("Capture device lost: "));
}

TEST(Source, ACameraThatGivesNothingIsRefusedAfterTenSeconds) {
  const auto begin = std::chrono::steady_clock::now();
  const auto lease = *Sources::instance().lease(camera("test://video?size=160x90&silent-after=0"));
  const auto problem = lease->waitUntilRunning(kPatience);
  ASSERT_TRUE(problem);
  EXPECT_EQ(problem->code, kDeviceSilent);
  EXPECT_GE(std::chrono::steady_clock::now() - begin, 10s);
}

TEST(Source, ASilentCameraIsLostAfterTwoSeconds) {
  const auto lease = *Sources::instance().lease(camera("test://video?size=160x90&silent-after=0.2"));
  ASSERT_FALSE(lease->waitUntilRunning(kPatience));
  const auto begin = std::chrono::steady_clock::now();
  const auto counter = std::make_shared<Counter>();
  lease->consumers().add(counter, {.picture = true, .sound = false});
  ASSERT_TRUE(counter->wait([](const auto& c) { return c.lost == 1; }));
  EXPECT_EQ(counter->counts().code, kDeviceSilent);
  EXPECT_LT(std::chrono::steady_clock::now() - begin, 6s);
}

TEST(Source, AMicrophoneIsOpenedAgain) {
  testing::LogCapture log;
  const auto lease = *Sources::instance().lease(microphone("test://audio?lost-after=0.5"));
  ASSERT_FALSE(lease->waitUntilRunning(kPatience));
  const auto counter = std::make_shared<Counter>();
  lease->consumers().add(counter, {.picture = false, .sound = true});
  ASSERT_TRUE(counter->wait([](const auto& c) { return c.away == 1; }));
  const int before = counter->counts().sounds;
  ASSERT_TRUE(counter->wait([&](const auto& c) { return c.back == 1 && c.sounds > before; }));
  EXPECT_EQ(counter->counts().lost, 0);
  EXPECT_TRUE(log.waitForPart("The microphone is away: "));
  EXPECT_TRUE(log.waitForPart("The microphone is back after "));
}

TEST(Source, AMicrophoneThatIsNotThereIsWaitedFor) {
  const auto lease = *Sources::instance().lease(microphone("alsa:no-such-card"));
  const auto problem = lease->waitUntilRunning(kPatience);
  ASSERT_TRUE(problem);
  EXPECT_EQ(problem->code, kDeviceNotFound);
  EXPECT_FALSE(lease->consumers().failure()) << "it may still come";
}

TEST(Source, ADeviceIsOpenedOnlyOnceItIsClosed) {
  const auto before = std::make_shared<Source>(camera("test://video?size=160x90"));
  ASSERT_TRUE(Source::open(before));
  ASSERT_FALSE(before->waitUntilRunning(kPatience));
  const auto next = std::make_shared<Source>(camera("test://video?size=160x90"));
  next->comeAfter(before);
  ASSERT_TRUE(Source::open(next));
  EXPECT_TRUE(next->waitUntilRunning(300ms)) << "it waits";
  before->close();
  EXPECT_FALSE(next->waitUntilRunning(kPatience));
  next->close();
  EXPECT_TRUE(next->finished(kPatience));
}

/// A driver that hangs in closing.
TEST(Source, ACameraThatIsNeverClosedIsBusyAndHoldsUpNobodyElse) {
  const auto hung = std::make_shared<Source>(camera("test://video?size=160x90"));
  ASSERT_TRUE(Source::open(hung));
  const auto next = std::make_shared<Source>(camera("test://video?size=160x90"));
  next->comeAfter(hung);
  ASSERT_TRUE(Source::open(next));
  const auto other = *Sources::instance().lease(camera("test://video?size=160x94"));
  EXPECT_FALSE(other->waitUntilRunning(kPatience));
  const auto problem = next->waitUntilRunning(kPatience);
  ASSERT_TRUE(problem);
  EXPECT_EQ(problem->code, kDeviceBusy);
  for (const auto& source : {hung, next}) {
    source->close();
    EXPECT_TRUE(source->finished(kPatience));
  }
}

TEST(Source, AFileThatWouldEndTheProcessIsRefused) {
  const auto lease = *Sources::instance().lease(camera("file:///movies/raw.nut"));
  const auto problem = lease->waitUntilRunning(kPatience);
  ASSERT_TRUE(problem);
  EXPECT_EQ(problem->message, "file:///movies/raw.nut: NUT files can't be played; convert it to .mkv");
}

TEST(Source, AllDevicesShareOneClock) {
  const auto eye = *Sources::instance().lease(camera("test://video?size=160x90"));
  const auto ear = *Sources::instance().lease(microphone("test://audio"));
  ASSERT_FALSE(eye->waitUntilRunning(kPatience));
  ASSERT_FALSE(ear->waitUntilRunning(kPatience));
  const auto counter = std::make_shared<Counter>();
  ear->consumers().add(counter, {.picture = false, .sound = true});
  ASSERT_TRUE(counter->wait([](const auto& c) { return c.sounds > 20; }));
  EXPECT_NEAR(counter->counts().lastSound, CaptureClock::now(), 0.25);
}

}  // namespace
}  // namespace lmx

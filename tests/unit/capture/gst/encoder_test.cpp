// An encoder that fails in the middle.
#include "capture/gst/encoder.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <future>
#include <limits>
#include <thread>

#include "capture/gst/gst_handles.h"
#include "tests/unit/doubles/journal.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

TEST(Encoder, AFailureIsToldOnceAndDoesNotHoldUpItsFeeder) {
  ensureGStreamer();
  testing::Journal problems;
  const Deadline patience;
  EncoderOutput output;
  output.onFormat = [](std::uint32_t, TrackFormat) {};
  output.onFrame = [](EncodedSample, std::uint32_t) {};
  output.onError = [&](const std::string& what) { problems.add(what); };
  auto created =
      Encoder::create({VideoEncoding{{160, 90}, frameRateFrom(30)}, std::nullopt}, patience, output);
  ASSERT_TRUE(created) << created.error().message;
  std::shared_ptr<Encoder> encoder = *std::move(created);
  std::promise<void> fed;
  std::thread feeder([encoder, &fed] {
    const BufferHandle tooSmall(gst_buffer_new_allocate(nullptr, 16, nullptr));  // no picture fits into it
    for (std::uint32_t place = 0; place < 200; ++place) encoder->pushVideo(tooSmall.get(), place, place == 0);
    fed.set_value();
  });
  const bool ended = fed.get_future().wait_for(20s) == std::future_status::ready;
  EXPECT_TRUE(ended) << "the feeder waits for an encoder that takes nothing any more";
  EXPECT_FALSE(encoder->finish(0, 1s));
  if (!ended) _exit(1);  // the feeder can't be joined
  feeder.join();
  EXPECT_TRUE(testing::waitUntil([&] { return !problems.entries().empty(); }));
  encoder = nullptr;  // with its threads: nothing more can be told
  EXPECT_EQ(problems.entries().size(), 1U);
}

TEST(Encoder, SoundThatIsNoSoundDoesNotEndIt) {
  ensureGStreamer();
  constexpr float kNone = std::numeric_limits<float>::quiet_NaN();
  constexpr float kEndless = std::numeric_limits<float>::infinity();
  testing::Journal problems;
  const Deadline patience;
  std::atomic<int> packets{0};
  EncoderOutput output;
  output.onFormat = [](std::uint32_t, TrackFormat) {};
  output.onSound = [&](const EncodedSample&) { ++packets; };
  output.onError = [&](const std::string& what) { problems.add(what); };
  const auto created = Encoder::create({std::nullopt, AudioEncoding{}}, patience, output);
  ASSERT_TRUE(created) << created.error().message;
  const auto& encoder = *created;
  std::vector<float> samples(std::size_t{2} * 480, 0.1F);
  for (int i = 0; i < 100; ++i) {
    samples[static_cast<std::size_t>(i)] = std::array{kNone, kEndless, -kEndless, 1e30F, 153.0F}[i % 5];
    encoder->pushAudio(samples.data(), 480);
  }
  EXPECT_TRUE(encoder->finish(48000, 20s));
  EXPECT_TRUE(problems.entries().empty());
  EXPECT_EQ(packets, 48) << "1,024 of delay and 48,000 samples in packets of 1,024, begun ones too";
}

/// A player that waited for the first sound would wait for ever where none comes.
TEST(Encoder, KnowsTheFormatOfItsSoundBeforeThereIsAny) {
  ensureGStreamer();
  for (const auto& [rate, channels] : std::vector<std::pair<int, int>>{{48000, 2}, {44100, 1}, {16000, 2}}) {
    const Deadline patience;
    std::vector<TrackFormat> formats;
    EncoderOutput output;
    output.onFormat = [&](std::uint32_t, TrackFormat format) { formats.push_back(std::move(format)); };
    output.onSound = [](const EncodedSample&) {};
    const auto created = Encoder::create({std::nullopt, AudioEncoding{rate, channels}}, patience, output);
    ASSERT_TRUE(created) << created.error().message;
    ASSERT_EQ(formats.size(), 1U) << "known at once";
    EXPECT_EQ(formats.front().timescale, static_cast<std::uint32_t>(rate));
    (*created)->pushAudio(nullptr, 5000);
    EXPECT_TRUE((*created)->finish(5000, 20s));
    EXPECT_EQ(formats.size(), 1U) << "the codec says the same as was foreseen: " << rate << " " << channels;
  }
}

TEST(Encoder, WhoFeedsItWaitsOnlyUntilThePatienceEnds) {
  ensureGStreamer();
  Deadline patience;
  std::promise<void> released;
  std::promise<void> blocked;
  EncoderOutput output;
  output.onFormat = [](std::uint32_t, TrackFormat) {};
  output.onFrame = [&, open = released.get_future().share(), first = true](EncodedSample,
                                                                           std::uint32_t) mutable {
    if (std::exchange(first, false)) blocked.set_value();
    open.wait();
  };
  const auto created =
      Encoder::create({VideoEncoding{{160, 90}, frameRateFrom(30)}, std::nullopt}, patience, output);
  ASSERT_TRUE(created) << created.error().message;
  std::promise<void> fed;
  std::thread feeder([&] {
    const BufferHandle picture(gst_buffer_new_allocate(nullptr, 160 * 90 * 3 / 2, nullptr));
    gst_buffer_memset(picture.get(), 0, 128, 160 * 90 * 3 / 2);
    for (std::uint32_t place = 0; place < 100; ++place) (*created)->pushVideo(picture.get(), place, false);
    fed.set_value();
  });
  blocked.get_future().wait();
  auto done = fed.get_future();
  EXPECT_EQ(done.wait_for(300ms), std::future_status::timeout) << "the encoder is full";
  patience.set(Deadline::Clock::now());
  EXPECT_EQ(done.wait_for(20s), std::future_status::ready);
  released.set_value();
  feeder.join();
}

}  // namespace
}  // namespace lmx

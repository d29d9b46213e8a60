// An encoder that fails in the middle.
#include "capture/encoder.h"

#include <gtest/gtest.h>

#include <future>
#include <thread>

#include "capture/gst_handles.h"
#include "tests/unit/doubles/journal.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

TEST(Encoder, AFailureIsToldOnceAndDoesNotHoldUpItsFeeder) {
  ensureGStreamer();
  testing::Journal problems;
  std::string problem;
  EncoderOutput output;
  output.onFormat = [](std::uint32_t, TrackFormat) {};
  output.onSample = [](EncodedSample) {};
  output.onError = [&](const std::string& what) { problems.add(what); };
  std::shared_ptr<Encoder> encoder =
      Encoder::create(VideoEncoding{{160, 90}, frameRateFrom(30)}, std::nullopt, output, &problem);
  ASSERT_TRUE(encoder) << problem;
  std::promise<void> fed;
  std::thread feeder([encoder, &fed] {
    const BufferHandle tooSmall(gst_buffer_new_allocate(nullptr, 16, nullptr));  // no picture fits into it
    for (std::uint32_t place = 0; place < 200; ++place) encoder->pushVideo(tooSmall.get(), place, place == 0);
    fed.set_value();
  });
  const bool ended = fed.get_future().wait_for(20s) == std::future_status::ready;
  EXPECT_TRUE(ended) << "the feeder waits for an encoder that takes nothing any more";
  EXPECT_EQ(problems.entries().size(), 1U);
  EXPECT_FALSE(encoder->finish(0, 1s));
  if (!ended) _exit(1);  // the feeder can't be joined
  feeder.join();
}

}  // namespace
}  // namespace lmx

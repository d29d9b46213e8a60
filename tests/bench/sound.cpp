// What steadying the sound and watching sound and picture cost, as a share of one core. Run by hand.
#include <cmath>
#include <cstdio>
#include <ctime>
#include <vector>

#include "capture/media/signal_watch.h"
#include "capture/source/steady_sound.h"

namespace lmx {
namespace {

double cpuSeconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

/// Sound of `seconds`, in chunks of `frames`, from a microphone that is 100 ppm fast.
double steadySoundShare(int frames, double seconds) {
  std::vector<float> samples(static_cast<std::size_t>(frames) * 2);
  for (std::size_t i = 0; i < samples.size(); ++i) {
    samples[i] = static_cast<float>(0.3 * std::sin(static_cast<double>(i)));
  }
  SteadySound sound;
  const double chunk = frames / 48000.0 * (1 - 100e-6);
  const auto chunks = static_cast<int>(seconds / chunk);
  const double begin = cpuSeconds();
  for (int i = 1; i <= chunks; ++i) {
    BufferHandle buffer(gst_buffer_new_allocate(nullptr, samples.size() * sizeof(float), nullptr));
    gst_buffer_fill(buffer.get(), 0, samples.data(), samples.size() * sizeof(float));
    (void)sound.feed(std::move(buffer), i * chunk + 0.0005 * (i % 7));
  }
  return (cpuSeconds() - begin) / seconds;
}

/// A noisy picture at 30 frames a second, and a tone in chunks of 10 ms.
double signalWatchShare(std::size_t width, std::size_t height, double seconds) {
  std::vector<std::uint8_t> luma(width * height);
  for (std::size_t i = 0; i < luma.size(); ++i) luma[i] = static_cast<std::uint8_t>(16 + i * 7919 % 200);
  std::vector<float> samples(960);
  for (std::size_t i = 0; i < samples.size(); ++i) {
    samples[i] = static_cast<float>(1.1 * std::sin(static_cast<double>(i)));  // too loud, which costs more
  }
  SignalWatch watch({});
  const double begin = cpuSeconds();
  for (int i = 0; i < seconds * 100; ++i) {
    const double t = i * 0.01;
    (void)watch.sound(samples, 2, 48000, t);
    if (i % 3 == 0 && watch.wantsPicture(t)) (void)watch.picture({luma.data(), width, width, height}, t);
  }
  return (cpuSeconds() - begin) / seconds;
}

}  // namespace
}  // namespace lmx

int main() {
  lmx::ensureGStreamer();
  for (const int frames : {480, 1024}) {
    std::printf("SteadySound, chunks of %4d: %.3f %% of a core\n", frames,
                100 * lmx::steadySoundShare(frames, 600));
  }
  std::printf("SignalWatch, 1920x1080 and sound: %.4f %% of a core\n",
              100 * lmx::signalWatchShare(1920, 1080, 600));
}

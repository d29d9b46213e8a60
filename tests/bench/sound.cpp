// What a microphone's sound costs on its way to a recording, as a share of one core. Run by hand.
#include <cmath>
#include <cstdio>
#include <ctime>
#include <vector>

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

}  // namespace
}  // namespace lmx

int main() {
  lmx::ensureGStreamer();
  for (const int frames : {480, 1024}) {
    std::printf("SteadySound, chunks of %4d: %.3f %% of a core\n", frames,
                100 * lmx::steadySoundShare(frames, 600));
  }
}

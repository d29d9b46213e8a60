// The time as the channels see it, so that trials can turn it by hand.
#include "control/channel/channel_clock.h"

#include <poll.h>

#include <array>

namespace lmx {
namespace {

class SystemChannelClock final : public ChannelClock {
 public:
  std::optional<TimeValue> now() override { return lmp_gettimeofday(); }
  std::chrono::steady_clock::time_point steadyNow() override { return std::chrono::steady_clock::now(); }
  void sleep(std::chrono::milliseconds span, int wake, int other) override {
    std::array<pollfd, 2> waited{{{wake, POLLIN, 0}, {other, POLLIN, 0}}};
    // A signal may end the sleep early: the callers look at their own condition again.
    ::poll(waited.data(), waited.size(), static_cast<int>(span.count()));
  }
};

}  // namespace

ChannelClock& systemChannelClock() {
  static auto* clock = new SystemChannelClock;  // reached by threads that outlive main: never destroyed
  return *clock;
}

}  // namespace lmx

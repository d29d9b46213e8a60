// The time as the channels see it, so that trials can turn it by hand.
#include "control/channel_clock.h"

#include <poll.h>

namespace lmx {
namespace {

class SystemChannelClock final : public ChannelClock {
 public:
  std::optional<TimeValue> now() override { return currentTime(); }
  void sleep(std::chrono::milliseconds span, int wake) override {
    pollfd waited{wake, POLLIN, 0};
    // A signal may end the sleep early: the callers look at their own condition again.
    ::poll(&waited, 1, static_cast<int>(span.count()));
  }
};

}  // namespace

ChannelClock& systemChannelClock() {
  static auto* clock = new SystemChannelClock;  // reached by threads that outlive main: never destroyed
  return *clock;
}

}  // namespace lmx

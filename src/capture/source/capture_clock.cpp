// Running time from the system clock.
#include "capture/source/capture_clock.h"

#include "capture/gst/gst_handles.h"
#include "support/time_value.h"

namespace lmx {
namespace {

GstClockTime systemTime() {
  const GstHandle<GstClock> clock(gst_system_clock_obtain());
  return gst_clock_get_time(clock.get());
}

GstClockTime epoch() {
  static const GstClockTime start = systemTime();
  return start;
}

}  // namespace

CaptureClock::CaptureClock(bool realTime) : real_time_(realTime), opened_at_(secondsSinceReferenceDate()) {}

double CaptureClock::wallOffset() const {
  return real_time_ ? secondsSinceReferenceDate() - now() : opened_at_;
}

double CaptureClock::now() {
  const GstClockTime start = epoch();  // first: it may be taken now
  return at(systemTime() < start ? start : systemTime());
}

double CaptureClock::at(GstClockTime time) {
  return (static_cast<double>(time) - static_cast<double>(epoch())) / 1e9;
}

}  // namespace lmx

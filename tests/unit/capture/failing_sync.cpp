// A disk that loses data: fdatasync of this program, which fails on demand.
#include "tests/unit/capture/failing_sync.h"

#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>

namespace {

std::atomic<int> to_fail{0};
std::atomic<bool> held{false};
std::atomic<int> waiting{0};

}  // namespace

namespace lmx::testing {

void failNextSyncs(int count) { to_fail = count; }

HeldSyncs::HeldSyncs() { held = true; }

HeldSyncs::~HeldSyncs() {
  held = false;
  held.notify_all();
}

bool HeldSyncs::anyHeld() { return waiting > 0; }

}  // namespace lmx::testing

extern "C" int fdatasync(int fd) {
  ++waiting;
  held.wait(true);
  --waiting;
  for (int left = to_fail; left > 0;) {
    if (!to_fail.compare_exchange_weak(left, left - 1)) continue;
    errno = EIO;
    return -1;
  }
  return static_cast<int>(syscall(SYS_fdatasync, fd));
}

// Passes signals from the handler through a pipe to the run loop.
#include "platform/signals.h"

#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <map>

#include "platform/log.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

std::atomic<int> write_end{-1};
static_assert(std::atomic<int>::is_always_lock_free, "the handler may take no lock");

extern "C" void writeSignalNumber(int number) {
  const int saved = errno;
  const auto byte = static_cast<unsigned char>(number);
  // A full pipe means that thousands are already pending, so this one may be dropped.
  [[maybe_unused]] const ssize_t n = write(write_end.load(), &byte, 1);
  errno = saved;
}

/// The read end of the pipe, created on first use. Never closed: a handler still running on another thread
/// must not write to a reused descriptor.
int signalPipe() {
  static const int read_end = [] {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC | O_NONBLOCK) != 0) {
      LMPLogMessage(nullptr, kLogCritical, "No pipe for signals: %s", std::strerror(errno));
      return -1;
    }
    write_end = ends[1];
    return ends[0];
  }();
  return read_end;
}

}  // namespace

struct SignalSource::Impl {
  std::map<int, struct sigaction> before;
  std::unique_ptr<RunLoop::Source> watch;
};

SignalSource::SignalSource(RunLoop& loop, const std::vector<int>& signals, std::function<void(int)> action)
    : impl_(std::make_unique<Impl>()) {
  const int pipe = signalPipe();
  if (pipe < 0) return;
  unsigned char stale = 0;
  while (read(pipe, &stale, 1) == 1) {
  }
  const auto shared = std::make_shared<const std::function<void(int)>>(std::move(action));
  // Posted rather than called, which frees the watch: a turn of the loop within the action can then deliver
  // the next signal.
  impl_->watch = loop.watchReadable(pipe, [&loop, pipe, shared] {
    unsigned char number = 0;
    if (read(pipe, &number, 1) == 1) loop.post([shared, number] { (*shared)(number); }, Wait::no);
  });
  struct sigaction handler {};
  handler.sa_handler = writeSignalNumber;
  handler.sa_flags = SA_RESTART;
  sigfillset(&handler.sa_mask);
  for (const int number : signals) sigaction(number, &handler, &impl_->before[number]);
}

SignalSource::~SignalSource() {
  for (const auto& [number, before] : impl_->before) sigaction(number, &before, nullptr);
}

}  // namespace lmx

// From the handler through a pipe to the loop.
#include "platform/signals.h"

#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <map>

#include "support/unique_fd.h"

namespace lmx {
namespace {

std::atomic<int> signal_pipe{-1};

extern "C" void onSignal(int number) {
  const int saved = errno;
  const auto byte = static_cast<unsigned char>(number);
  // A full pipe means that hundreds are waiting already: one more tells nothing new.
  [[maybe_unused]] const ssize_t n = write(signal_pipe.load(), &byte, 1);
  errno = saved;
}

}  // namespace

struct SignalSource::Impl {
  UniqueFd reading;
  UniqueFd writing;
  std::map<int, struct sigaction> before;
  std::function<void(int)> action;
  std::unique_ptr<RunLoop::Source> watch;
};

SignalSource::SignalSource(RunLoop& loop, const std::vector<int>& signals, std::function<void(int)> action)
    : impl_(std::make_unique<Impl>()) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC | O_NONBLOCK) != 0) return;
  impl_->reading.reset(ends[0]);
  impl_->writing.reset(ends[1]);
  impl_->action = std::move(action);
  signal_pipe = ends[1];
  impl_->watch = loop.watchReadable(ends[0], [impl = impl_.get()] {
    unsigned char number = 0;
    while (read(impl->reading.get(), &number, 1) == 1) impl->action(number);
  });
  struct sigaction handler {};
  handler.sa_handler = onSignal;
  handler.sa_flags = SA_RESTART;
  sigfillset(&handler.sa_mask);
  for (const int number : signals) sigaction(number, &handler, &impl_->before[number]);
}

SignalSource::~SignalSource() {
  for (const auto& [number, before] : impl_->before) sigaction(number, &before, nullptr);
  impl_->watch.reset();
  signal_pipe = -1;
}

}  // namespace lmx

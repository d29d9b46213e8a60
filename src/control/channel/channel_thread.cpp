// The thread of one channel, and the descriptor that wakes it.
#include "control/channel/channel_thread.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <cstdint>
#include <exception>
#include <utility>

namespace lmx {

ChannelThread::ChannelThread() : wake_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

ChannelThread::~ChannelThread() {
  askToStop();
  waitUntilEnded();
}

bool ChannelThread::start(std::function<void()> body, const std::function<void()>& announce) {
  {
    const std::lock_guard lock(mutex_);
    // Set before the thread exists: a stop that comes before its first instruction must not be undone by it.
    running_ = true;
    ended_ = false;
    try {
      thread_ = std::thread([this, body = std::move(body)] { live(body); });
    } catch (const std::exception&) {  // no thread to be had, or no memory
      running_ = false;
      ended_ = true;
      return false;
    }
    started_ = true;
  }
  announce();
  announced_.count_down();
  return true;
}

void ChannelThread::live(const std::function<void()>& body) noexcept {
  announced_.wait();
  id_ = std::this_thread::get_id();
  body();
  id_ = std::thread::id();  // the system may give it to another thread from now on
  ended_ = true;
}

void ChannelThread::askToStop() {
  running_ = false;
  const std::uint64_t one = 1;
  // Can only fail when it is readable already.
  [[maybe_unused]] const auto written = ::write(wake_.get(), &one, sizeof one);
}

bool ChannelThread::waitUntilEnded() {
  const std::lock_guard lock(mutex_);
  if (thread_.joinable()) thread_.join();
  return started_;
}

}  // namespace lmx

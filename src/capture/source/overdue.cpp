// One thread that waits for the end or for the limit.
#include "capture/source/overdue.h"

#include <utility>

namespace lmx {

Overdue::Overdue(std::chrono::milliseconds limit, std::function<void()> tell)
    : tell_(std::move(tell)), thread_([this, limit] { wait(limit); }) {}

Overdue::~Overdue() {
  {
    const std::lock_guard lock(mutex_);
    over_ = true;
  }
  changed_.notify_all();
  thread_.join();
}

void Overdue::wait(std::chrono::milliseconds limit) {
  {
    std::unique_lock lock(mutex_);
    if (changed_.wait_for(lock, limit, [this] { return over_; })) return;
  }
  tell_();
}

}  // namespace lmx

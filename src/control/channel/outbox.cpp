// Replies that were given on another thread than the channel's and wait for that to send them.
#include "control/channel/outbox.h"

#include <sys/eventfd.h>

#include <utility>

namespace lmx {

Outbox::Outbox(std::size_t limit) : limit_(limit), ready_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

bool Outbox::push(Entry entry) {
  const std::lock_guard lock(mutex_);
  if (waiting_.size() >= limit_ || bytes_ + entry.reply.size() > kOutboxBytes) return false;
  bytes_ += entry.reply.size();
  waiting_.push_back(std::move(entry));
  ::eventfd_write(ready_.get(), 1);  // can only fail when it is readable already
  return true;
}

std::deque<Outbox::Entry> Outbox::takeAll() {
  const std::lock_guard lock(mutex_);
  eventfd_t count = 0;
  ::eventfd_read(ready_.get(), &count);
  bytes_ = 0;
  return std::exchange(waiting_, {});
}

}  // namespace lmx

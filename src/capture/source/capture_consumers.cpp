// Delivers media and errors to every consumer.
#include "capture/source/capture_consumers.h"

#include "platform/log.h"

namespace lmx {

void CaptureConsumers::add(const std::shared_ptr<CaptureConsumer>& consumer) {
  std::optional<CaptureError> failure;
  {
    const std::lock_guard lock(mutex_);
    consumers_.push_back(consumer);
    failure = failure_;
  }
  if (failure) consumer->onCaptureError(*failure);
}

void CaptureConsumers::remove(const CaptureConsumer* consumer) {
  const std::lock_guard lock(mutex_);
  std::erase_if(consumers_, [&](const auto& weak) {
    const auto held = weak.lock();
    return !held || held.get() == consumer;
  });
}

CaptureConsumers::Held CaptureConsumers::heldLocked() const {
  Held held;
  for (const auto& weak : consumers_) {
    if (auto consumer = weak.lock()) held.push_back(std::move(consumer));
  }
  return held;
}

void CaptureConsumers::deliver(Medium medium, GstBuffer* buffer, double runningTime) const {
  Held consumers;
  {
    const std::lock_guard lock(mutex_);
    consumers = heldLocked();
  }
  for (const auto& consumer : consumers) {
    BufferHandle reference(gst_buffer_ref(buffer));
    medium == Medium::video ? consumer->onVideo(std::move(reference), runningTime)
                            : consumer->onAudio(std::move(reference), runningTime);
  }
}

void CaptureConsumers::fail(const CaptureError& error) {
  Held consumers;
  {
    const std::lock_guard lock(mutex_);
    if (failure_) return;
    failure_ = error;
    consumers = heldLocked();
  }
  LMPLogMessage(nullptr, kLogError, "Capture device lost: %s (code %d)", error.message.c_str(), error.code);
  for (const auto& consumer : consumers) consumer->onCaptureError(error);
}

std::optional<CaptureError> CaptureConsumers::failure() const {
  const std::lock_guard lock(mutex_);
  return failure_;
}

}  // namespace lmx

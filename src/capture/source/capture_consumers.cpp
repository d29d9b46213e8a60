// Delivers media and news to every consumer.
#include "capture/source/capture_consumers.h"

namespace lmx {

void CaptureConsumers::add(const std::shared_ptr<CaptureConsumer>& consumer, SourceUse use) {
  const std::lock_guard news(news_mutex_);
  std::optional<CaptureError> failure;
  std::optional<CaptureError> away;
  std::optional<CaptureError> mute;
  {
    const std::lock_guard lock(mutex_);
    users_.push_back({consumer, use});
    failure = failure_;
    away = away_;
    mute = mute_;
  }
  if (failure) return consumer->onSourceLost(use, *failure);
  if (away) consumer->onSourceAway(use, *away);
  if (mute && use.sound) consumer->onSourceAway({.picture = false, .sound = true}, *mute);
}

void CaptureConsumers::remove(const CaptureConsumer* consumer) {
  const std::lock_guard lock(mutex_);
  std::erase_if(users_, [&](const User& user) {
    const auto held = user.consumer.lock();
    return !held || held.get() == consumer;
  });
}

std::vector<CaptureConsumers::Held> CaptureConsumers::heldLocked() const {
  std::vector<Held> held;
  for (const User& user : users_) {
    if (auto consumer = user.consumer.lock()) held.push_back({std::move(consumer), user.use});
  }
  return held;
}

std::vector<CaptureConsumers::Held> CaptureConsumers::held() const {
  const std::lock_guard lock(mutex_);
  return heldLocked();
}

void CaptureConsumers::deliverPicture(GstSample* picture, double time) const {
  for (const Held& user : held()) {
    if (user.use.picture) user.consumer->onPicture(SampleHandle(gst_sample_ref(picture)), time);
  }
}

void CaptureConsumers::deliverSound(GstBuffer* sound, double time) const {
  for (const Held& user : held()) {
    if (user.use.sound) user.consumer->onSound(BufferHandle(gst_buffer_ref(sound)), time);
  }
}

void CaptureConsumers::lost(const CaptureError& error) {
  const std::lock_guard news(news_mutex_);
  std::vector<Held> users;
  {
    const std::lock_guard lock(mutex_);
    if (failure_) return;
    failure_ = error;
    users = heldLocked();
  }
  for (const Held& user : users) user.consumer->onSourceLost(user.use, error);
}

void CaptureConsumers::away(const CaptureError& error) {
  const std::lock_guard news(news_mutex_);
  std::vector<Held> users;
  {
    const std::lock_guard lock(mutex_);
    if (failure_ || away_) return;
    away_ = error;
    users = heldLocked();
  }
  for (const Held& user : users) user.consumer->onSourceAway(user.use, error);
}

void CaptureConsumers::noSound(const CaptureError& error) {
  const std::lock_guard news(news_mutex_);
  std::vector<Held> users;
  {
    const std::lock_guard lock(mutex_);
    if (failure_ || mute_) return;
    mute_ = error;
    users = heldLocked();
  }
  for (const Held& user : users) {
    if (user.use.sound) user.consumer->onSourceAway({.picture = false, .sound = true}, error);
  }
}

void CaptureConsumers::soundBack(double seconds) {
  const std::lock_guard news(news_mutex_);
  std::vector<Held> users;
  {
    const std::lock_guard lock(mutex_);
    if (!mute_) return;
    mute_ = std::nullopt;
    users = heldLocked();
  }
  for (const Held& user : users) {
    if (user.use.sound) user.consumer->onSourceBack({.picture = false, .sound = true}, seconds);
  }
}

void CaptureConsumers::back(double seconds) {
  const std::lock_guard news(news_mutex_);
  std::vector<Held> users;
  {
    const std::lock_guard lock(mutex_);
    if (!away_) return;
    away_ = std::nullopt;
    users = heldLocked();
  }
  for (const Held& user : users) user.consumer->onSourceBack(user.use, seconds);
}

std::optional<CaptureError> CaptureConsumers::failure() const {
  const std::lock_guard lock(mutex_);
  return failure_;
}

}  // namespace lmx

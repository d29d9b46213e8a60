// Counts the users of each source.
#include "capture/source/sources.h"

#include <algorithm>

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kClosingPatience = 2s;
constexpr auto kReopeningPatience = 5s;

/// A synthetic device is a camera and a microphone under one name.
std::string keyOf(const SourceWish& wish) {
  const bool synthetic = parseDeviceID(wish.device).kind == DeviceKind::test;
  return wish.device + (synthetic && !wish.picture ? " sound" : "");
}

CaptureError busy(const Source& source) {
  return {CaptureError::kDomain, kDeviceBusy, source.name() + ": is still being closed"};
}

}  // namespace

Sources& Sources::instance() {
  static auto* sources = new Sources;
  return *sources;
}

Result<SourceLease, CaptureError> Sources::lease(const SourceWish& wish) {
  const std::string key = keyOf(wish);
  std::shared_ptr<Entry> entry;
  const auto deadline = std::chrono::steady_clock::now() + kReopeningPatience;
  for (;;) {
    std::shared_ptr<Entry> closing;
    {
      const std::lock_guard lock(mutex_);
      for (const auto& other : entries_) {
        if (other->key == key && other->users == 0 && other->source->clock().realTime()) closing = other;
      }
      entry = closing ? nullptr : findLocked(key);
      if (entry) {
        ++entry->users;
      } else if (!closing) {
        entry = std::make_shared<Entry>(Entry{key, std::make_shared<Source>(wish), 1});
        entries_.push_back(entry);
        if (!Source::open(entry->source)) {
          entries_.pop_back();
          return CaptureError{CaptureError::kDomain, kDeviceFailed,
                              entry->source->name() + ": no thread could be started for it"};
        }
      }
    }
    if (entry) {
      if (wish.picture) entry->source->useAsCamera();
      break;
    }
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    if (left <= 0ms || !closing->source->finished(left)) return busy(*closing->source);
    forget(closing);
  }
  return SourceLease(entry->source.get(), [this, entry](Source*) { giveBack(entry); });
}

/// One that is lost is of no use to anybody new: its device is closed, and may be opened again. Nor is one of
/// "speed=max", whose time began with its first user.
std::shared_ptr<Sources::Entry> Sources::findLocked(const std::string& key) const {
  const auto found = std::find_if(entries_.begin(), entries_.end(), [&](const auto& entry) {
    return entry->key == key && entry->users > 0 && entry->source->clock().realTime() &&
           !entry->source->consumers().failure();
  });
  return found == entries_.end() ? nullptr : *found;
}

void Sources::giveBack(const std::shared_ptr<Entry>& entry) {
  {
    const std::lock_guard lock(mutex_);
    if (--entry->users > 0) return;
  }
  entry->source->close();
  if (entry->source->finished(kClosingPatience)) forget(entry);
}

void Sources::forget(const std::shared_ptr<Entry>& entry) {
  const std::lock_guard lock(mutex_);
  std::erase(entries_, entry);
}

bool Sources::delivers(const std::string& device) const {
  const std::lock_guard lock(mutex_);
  return std::any_of(entries_.begin(), entries_.end(), [&](const auto& entry) {
    return entry->users > 0 && entry->source->wish().device == device && entry->source->isRunning();
  });
}

std::vector<HardwareDevice> Sources::hardware() const {
  std::vector<HardwareDevice> devices = listHardware();
  const std::lock_guard lock(mutex_);
  for (const auto& entry : entries_) {
    const auto open = entry->source->hardware();
    const bool listed = open && std::any_of(devices.begin(), devices.end(), [&](const HardwareDevice& device) {
                          return device.uniqueID == open->uniqueID;
                        });
    if (open && !listed) devices.push_back(copyOf(*open));
  }
  sortDevices(devices);
  return devices;
}

}  // namespace lmx

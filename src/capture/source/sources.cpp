// Counts the users of each source.
#include "capture/source/sources.h"

#include <algorithm>
#include <iterator>

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kClosingPatience = 2s;

/// A file or an address used for its sound alone is watched and tried again like a microphone.
std::string keyOf(const SourceWish& wish) { return wish.device + (wish.picture ? "" : " sound"); }

bool givesBoth(const std::string& device) {
  const DeviceKind kind = parseDeviceID(device).kind;
  return kind == DeviceKind::file || kind == DeviceKind::network;
}

CaptureError noThread(const Source& source) {
  return {CaptureError::kDomain, kDeviceFailed, source.name() + ": no thread could be started for it"};
}

}  // namespace

Sources& Sources::instance() {
  static auto* sources = new Sources;
  return *sources;
}

Result<SourceLease, CaptureError> Sources::lease(const SourceWish& wish) {
  const std::lock_guard lock(mutex_);
  std::shared_ptr<Entry> entry = findLocked(wish);
  if (entry) {
    ++entry->users;
  } else {
    entry = std::make_shared<Entry>(Entry{keyOf(wish), std::make_shared<Source>(wish), 1});
    entry->source->comeAfter(closingLocked(wish));
    if (!Source::open(entry->source)) return noThread(*entry->source);
    entries_.push_back(entry);
  }
  return SourceLease(entry->source.get(), [this, entry](Source*) { giveBack(entry); });
}

/// Whether that is the device which `wish` means.
bool Sources::same(const Entry& entry, const SourceWish& wish) {
  if (entry.key == keyOf(wish)) return true;
  if (!wish.picture && givesBoth(wish.device) && entry.source->wish().device == wish.device) return true;
  const auto hardware = entry.source->hardware();
  if (!hardware || hardware->isVideo || wish.picture) return false;
  return wish.device == kAnyMicrophone || wish.device == hardware->uniqueID;
}

/// One that is lost is of no use to anybody new: its device is closed, and may be opened again. Nor is one of
/// "speed=max", whose time began with its first user.
std::shared_ptr<Sources::Entry> Sources::findLocked(const SourceWish& wish) const {
  const auto found = std::find_if(entries_.begin(), entries_.end(), [&](const auto& entry) {
    return entry->users > 0 && entry->source->clock().realTime() && !entry->source->consumers().failure() &&
           same(*entry, wish);
  });
  return found == entries_.end() ? nullptr : *found;
}

/// The newest one that is closing the device; null when there is none.
std::shared_ptr<Source> Sources::closingLocked(const SourceWish& wish) const {
  const auto found = std::find_if(entries_.rbegin(), entries_.rend(), [&](const auto& entry) {
    return entry->users == 0 && entry->source->clock().realTime() && same(*entry, wish);
  });
  return found == entries_.rend() ? nullptr : (*found)->source;
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

void Sources::waitUntilClosed(std::chrono::milliseconds limit) {
  const auto deadline = std::chrono::steady_clock::now() + limit;
  std::vector<std::shared_ptr<Entry>> closing;
  {
    const std::lock_guard lock(mutex_);
    std::copy_if(entries_.begin(), entries_.end(), std::back_inserter(closing),
                 [](const auto& entry) { return entry->users == 0; });
  }
  for (const auto& entry : closing) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    if (left > 0ms && entry->source->finished(left)) forget(entry);
  }
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
    const bool listed =
        open && std::any_of(devices.begin(), devices.end(),
                            [&](const HardwareDevice& device) { return device.uniqueID == open->uniqueID; });
    if (open && !listed) devices.push_back(copyOf(*open));
  }
  sortDevices(devices);
  return devices;
}

}  // namespace lmx

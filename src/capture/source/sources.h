// Hands out the machine's cameras and microphones, each opened once for all who use it.
#pragma once
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "capture/source/source.h"
#include "support/result.h"

namespace lmx {

/// Keeps a source open. When the last lease of it goes the device is closed; whoever drops it waits for that,
/// two seconds at most. Never drop it on a streaming thread.
using SourceLease = std::shared_ptr<Source>;

/// Leases go by device: preview, recording and probe share what is open, whatever else they want of it. A
/// device is not opened while it is still being closed; nobody waits for another device. "Any microphone" is
/// the one that is open, if there is one. Thread-safe.
class Sources {
 public:
  /// Those of this process. Never destroyed: threads that outlive main may still return leases.
  static Sources& instance();

  /// Begins to open the device, or joins those who use it. Does not block.
  Result<SourceLease, CaptureError> lease(const SourceWish& wish);
  /// Whether somebody uses the device and it delivers.
  [[nodiscard]] bool delivers(const std::string& device) const;
  /// Waits until all devices are closed that nobody uses any more, at most `limit`.
  void waitUntilClosed(std::chrono::milliseconds limit);
  /// What is plugged in, with what is open here: lists leave out devices that are in use.
  [[nodiscard]] std::vector<HardwareDevice> hardware() const;

 private:
  struct Entry {
    std::string key;
    std::shared_ptr<Source> source;
    int users = 0;  ///< 0: being closed
  };
  Sources() = default;
  [[nodiscard]] static bool same(const Entry& entry, const SourceWish& wish);
  [[nodiscard]] std::shared_ptr<Entry> findLocked(const SourceWish& wish) const;
  [[nodiscard]] std::shared_ptr<Source> closingLocked(const SourceWish& wish) const;
  void giveBack(const std::shared_ptr<Entry>& entry);
  void forget(const std::shared_ptr<Entry>& entry);

  mutable std::mutex mutex_;
  std::vector<std::shared_ptr<Entry>> entries_;  // guarded by mutex_
};

}  // namespace lmx

// Message bus connections with a time limit on every call, so that an unresponsive bus can't block the agent.
#pragma once
#include <gio/gio.h>

#include <chrono>
#include <memory>
#include <string>
#include <thread>

#include "support/result.h"
#include "support/unique_fd.h"

namespace lmx {

inline constexpr std::chrono::milliseconds kBusLimit{2000};

/// Cancels every operation that uses cancellable() once `kBusLimit` has passed since construction.
class BusTimeLimit {
 public:
  BusTimeLimit();
  ~BusTimeLimit();
  BusTimeLimit(const BusTimeLimit&) = delete;
  BusTimeLimit& operator=(const BusTimeLimit&) = delete;

  [[nodiscard]] GCancellable* cancellable() const { return cancellable_; }

 private:
  void watch();

  GCancellable* cancellable_;
  UniqueFd finished_;  ///< an eventfd
  std::thread watcher_;
};

struct BusClose {
  void operator()(GDBusConnection* bus) const;
};
/// A private connection, not the one that GIO shares within the process. Closed with its owner.
using BusConnection = std::unique_ptr<GDBusConnection, BusClose>;

/// Connects to the system or the session bus. Never starts a bus. Fails when there is none or it does not
/// answer in time.
Result<BusConnection> connectToBus(GBusType type, const BusTimeLimit& limit);

/// Moves the message out of `error`, which may be null, and frees it.
std::string takeMessage(GError* error);

}  // namespace lmx

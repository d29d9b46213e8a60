// Decides whether and when a device is opened again.
#pragma once
#include <chrono>
#include <optional>

#include "capture/source/device_id.h"

namespace lmx {

/// A camera that is plugged in is not tried again once it has failed: unplugged, it would come back as
/// another one. A network camera that has worked gets ten seconds. A microphone is tried as long as anybody
/// wants it. Pure; not thread-safe.
class RetryPolicy {
 public:
  using Milliseconds = std::chrono::milliseconds;
  /// @param picture  whether the device is used as a camera
  RetryPolicy(DeviceKind kind, bool picture) : network_(kind == DeviceKind::network), picture_(picture) {}

  /// What has happened to the device.
  struct Failure {
    int code = 0;                         ///< of the error
    bool everRan = false;                 ///< it has delivered, in whatever try
    bool delivered = false;               ///< it has delivered in this try
    Milliseconds wantedFor{};             ///< since its first user came
    Milliseconds triedFor{};              ///< since this try began
    std::optional<Milliseconds> awayFor;  ///< absent while nobody has been told that it is away
  };
  struct Next {
    enum class Step { again, away, lost };
    Step step = Step::lost;  ///< again: nobody need know; away: its users are told, unless they have been
    Milliseconds pause{};    ///< before the next try
  };
  [[nodiscard]] Next after(const Failure& failure);
  /// Whether the next try is over UDP. A network camera is asked for TCP first.
  [[nodiscard]] bool overUdp() const { return over_udp_; }

  /// A network camera that is away gets that long; a try that still runs then has failed.
  static constexpr Milliseconds kNetworkLimit = std::chrono::seconds(10);

 private:
  [[nodiscard]] bool offersOnlyUdp(const Failure& failure) const;
  [[nodiscard]] bool isAboutToBeReleased(const Failure& failure) const;
  [[nodiscard]] bool isWorthAnotherTry(const Failure& failure) const;
  [[nodiscard]] Milliseconds pauseAfter(const Failure& failure) const;

  const bool network_;
  const bool picture_;
  bool over_udp_ = false;
  int failed_tries_ = 0;  ///< since it went away
};

}  // namespace lmx

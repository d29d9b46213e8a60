// Why a channel gives up a connection whose peer is still there.
#pragma once
#include <atomic>
#include <cstdint>

#include "control/channel/channel_clock.h"
#include "control/handlers/channel_context.h"
#include "support/time_value.h"

namespace lmx {

/// Whether `lastContact` lies more than ten minutes before `now`.
bool contactIsLost(const TimeValue& now, const TimeValue& lastContact);

class ReconnectReasons {
 public:
  /// Both outlive this object.
  ReconnectReasons(const ChannelContext& context, ChannelClock& clock) : context_(context), clock_(clock) {}

  /// The network has changed just now. Any thread.
  void networkChanged();
  /// Whether the connection is to be made anew (logged): a second after a change of the network, or after ten
  /// minutes without a command. Each event gives one yes. Channel thread.
  [[nodiscard]] bool mustReconnect();

 private:
  bool networkHasChanged();
  bool lastContactTimedOut();

  const ChannelContext& context_;
  ChannelClock& clock_;
  std::atomic<std::int64_t> netTransitionTime_{0};  // seconds since 1970; 0: no change is pending
};

}  // namespace lmx

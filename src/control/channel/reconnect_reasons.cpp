// Why a channel gives up a connection whose peer is still there.
#include "control/channel/reconnect_reasons.h"

#include "record/agent_record.h"

namespace lmx {
namespace {

constexpr std::int64_t kContactLostMilliseconds = 600001;

}  // namespace

bool contactIsLost(const TimeValue& now, const TimeValue& lastContact) {
  return lmp_diff_timeval(now, lastContact) >= kContactLostMilliseconds;
}

void ReconnectReasons::networkChanged() {
  context_.logInfo("A network transition was received.");
  if (const auto now = clock_.now()) netTransitionTime_ = now->tv_sec;
}

bool ReconnectReasons::mustReconnect() { return networkHasChanged() || lastContactTimedOut(); }

bool ReconnectReasons::networkHasChanged() {
  auto changed = netTransitionTime_.load();
  if (changed <= 0) return false;
  const auto now = clock_.now();
  if (!now || now->tv_sec <= changed) return false;
  // A change that is reported right now keeps its place.
  netTransitionTime_.compare_exchange_strong(changed, 0);
  context_.logDebug("The connection is made anew after a network change");
  return true;
}

bool ReconnectReasons::lastContactTimedOut() {
  const auto session = context_.session();
  const auto last = session ? session->lastContact.get() : std::nullopt;
  if (!last) return false;
  const auto now = clock_.now();
  if (!now || !contactIsLost(*now, *last)) return false;
  session->lastContact.set(std::nullopt);
  LMPLogMessage(context_.log(), kLogNotice, "Too long since last contact from server.  Reconnecting...");
  return true;
}

}  // namespace lmx

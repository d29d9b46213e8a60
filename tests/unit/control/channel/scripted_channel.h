// A channel without a transport, and a clock that is turned by hand.
#pragma once
#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "control/channel/agent_control_base.h"
#include "control/channel/channel_clock.h"
#include "record/agent_record.h"
#include "tests/unit/doubles/journal.h"

namespace lmx::testing {

/// Wall clock plus an offset that the test sets, or a moment that it names; sleeping takes no time and is
/// written down.
class TurnedClock : public ChannelClock {
 public:
  std::atomic<std::int64_t> ahead_seconds{0};
  std::atomic<std::int64_t> frozen_at{-1};  ///< seconds since 1970; negative: running
  std::atomic<bool> readable{true};
  Journal sleeps;

  std::optional<TimeValue> now() override {
    auto time = lmp_gettimeofday();
    if (!readable || !time) return std::nullopt;
    if (frozen_at >= 0) return TimeValue{frozen_at, 0};
    time->tv_sec += ahead_seconds;
    return time;
  }
  std::atomic<bool> real_sleep{false};
  void sleep(std::chrono::milliseconds span, int wake, int other) override {
    sleeps.add(std::to_string(span.count()));
    if (real_sleep) systemChannelClock().sleep(span, wake, other);
  }
};

/// Takes lines as they are and collects replies. Connections come from `on_connect`, set before the thread
/// starts.
class ScriptedChannel final : public AgentControlBase {
 public:
  using AgentControlBase::AgentControlBase;
  ~ScriptedChannel() override { stop(); }

  bool requires_authentication = false;
  bool readable_lines = true;
  std::function<int(ScriptedChannel&)> on_connect;
  std::function<void(ScriptedChannel&)> on_reply;

  void receive(std::string_view chunk) {
    packetReceived(chunk.data(), static_cast<std::uint32_t>(chunk.size()));
  }
  [[nodiscard]] std::vector<std::string> replies() const { return replies_.entries(); }
  void useSocket(int socket) { setServerSocket(socket); }

  bool requiresAuthentication() const override { return requires_authentication; }
  void setAuthenticated(bool authenticated) override { requires_authentication = !authenticated; }

 protected:
  int connect() override { return on_connect ? on_connect(*this) : -1; }
  std::optional<std::string> commandFromReceivedData(const std::string& line) override {
    if (!readable_lines) return std::nullopt;
    return line;
  }
  void sendReply(const std::string& reply) override {
    replies_.add(reply);
    if (on_reply) on_reply(*this);
  }

 private:
  Journal replies_;
};

}  // namespace lmx::testing

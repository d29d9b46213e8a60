// What the control channels share: start, connect with back-off, receive until the connection is gone, stop.
#include "control/channel/agent_control_base.h"

#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <exception>
#include <utility>
#include <vector>

#include "control/channel/back_off.h"
#include "control/protocol/command_text.h"
#include "platform/net/socket_io.h"
#include "support/format.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kReceiveWait = 2s;

/// One command or reply that can't be dealt with must not cost the channel.
template <class Work>
void runGuarded(const ChannelContext& context, const Work& work) {
  try {
    work();
  } catch (const std::exception& problem) {
    LMPLogMessage(context.log(), kLogCritical, "Internal error occurred: %s", problem.what());
  }
}

}  // namespace

AgentControlBase::AgentControlBase(ChannelKind kind, std::shared_ptr<AgentContext> context,
                                   AgentActions* actions, ChannelClock& clock)
    : context_(std::move(context)),
      actions_(actions),
      clock_(clock),
      handlers_(context_, actions, *this, kind),
      dispatcher_(context_, handlers_, *this),
      reconnect_reasons_(context_, clock) {}

bool AgentControlBase::initWithAgentContext() {
  LMPLogMessage(context_.log(), kLogNotice, "Control module is starting...");
  if (registerForNetworkChange() == -1) return false;
  if (!clock_.now()) {  // without the time a lost server would never be noticed
    LMPLogMessage(context_.log(), kLogCritical, "Internal error occurred");
    return false;
  }
  const auto announce = [this] {
    LMPLogMessage(context_.log(), kLogNotice, "Control module started with success");
  };
  if (thread_.canBeStopped() && outbox_.usable() && thread_.start([this] { runSafely(); }, announce))
    return true;
  LMPLogMessage(context_.log(), kLogError, "Control module cannot be started");
  return false;
}

int AgentControlBase::registerForNetworkChange() {
  if (actions_ == nullptr) return 0;
  network_watch_ = actions_->watchNetwork([this] { reconnect_reasons_.networkChanged(); });
  if (network_watch_) return 0;
  LMPLogMessage(context_.log(), kLogError,
                "Unable to create dynamic store for Netvane registration for Network Notification");
  LMPLogMessage(context_.log(), kLogError, "Unable to register for network notifications");
  return -1;
}

void AgentControlBase::runSafely() noexcept {
  try {
    run();
  } catch (const std::exception& problem) {
    LMPLogMessage(context_.log(), kLogCritical, "Control channel has ended: %s", problem.what());
    sockets_.closeAll();  // a peer must not wait for answers that nobody gives
  }
}

int AgentControlBase::run() {
  while (running() && connectWithBackOff()) {
    // Only now, when the new connection exists: a server never sees the agent without any.
    disconnectOld();
    receiveUntilGone();
    sockets_.retireCurrent();
  }
  return 0;
}

/// @return false when the channel is to stop.
bool AgentControlBase::connectWithBackOff() {
  for (auto delay = kFirstBackOff; sockets_.current() == -1;) {
    if (!running()) return false;
    if (connect() == 1) {
      context_.logInfo(string_with_format("Failed to connect to server, retrying in %d seconds.",
                                          static_cast<int>(delay.count())));
      // A stop ends the sleep at once.
      if (running()) clock_.sleep(delay, wakeDescriptor(), sockets_.previousIfAlive());
      delay = nextBackOff(delay);
    }
    if (sockets_.current() == -1) takeBackPreviousPeer();
  }
  return true;
}

/// Gives the previous peer its place again if it has said something: one that lost it to a change of the
/// network, or to ten minutes without a command, knows nothing of that, and its STOP must not be lost.
void AgentControlBase::takeBackPreviousPeer() {
  if (!sockets_.previousSpeaks()) return;
  context_.logDebug("The previous peer speaks again");
  sockets_.restorePrevious();
}

void AgentControlBase::receiveUntilGone() {
  peer_has_gone_ = false;
  while (running() && !peer_has_gone_) {
    if (reconnect_reasons_.mustReconnect()) break;
    peer_has_gone_ = !waitForPacket();
  }
  flushReplies();  // what was given before the end is still this peer's
}

/// @return false when the connection is gone.
bool AgentControlBase::waitForPacket() {
  const int socket = sockets_.current();
  if (socket == -1) return false;
  std::vector<int> others{outbox_.descriptor()};
  std::chrono::milliseconds limit = kReceiveWait;
  if (const auto* acceptor = peerAcceptor()) limit = std::min(limit, acceptor->addOthers(others));
  auto readiness = awaitReadable(socket, wakeDescriptor(), limit, others);
  if (readiness == Readiness::interrupted) clock_.sleep(1ms, wakeDescriptor());
  if (readiness == Readiness::otherReadable) {
    flushReplies();
    readiness = somebodySpeaks() ? Readiness::readable : Readiness::timedOut;
  }
  if (readiness == Readiness::readable && running()) return receivePacket(sockets_.current());
  return readiness != Readiness::badDescriptor;
}

/// Whether the present peer is to be read, which may be another one now. Of several that talk each has its
/// turn: who is set aside for another stands behind all others that were.
bool AgentControlBase::somebodySpeaks() {
  PeerAcceptor* const acceptor = peerAcceptor();
  if (acceptor != nullptr && acceptor->takeSpeaking()) return true;
  if (isReadable(sockets_.current())) return true;
  if (acceptor != nullptr) acceptor->takeWaiting();
  return false;
}

bool AgentControlBase::receivePacket(int socket) {
  std::array<char, 1024> buffer{};
  const ssize_t received = ::recv(socket, buffer.data(), buffer.size(), MSG_DONTWAIT);
  if (received == 0) return connected();
  if (received < 0) return errno != EBADF && errno != ECONNRESET && errno != ETIMEDOUT;
  if (auto* acceptor = peerAcceptor()) acceptor->heard();
  packetReceived(buffer.data(), static_cast<std::uint32_t>(received));
  return true;
}

void AgentControlBase::packetReceived(const char* bytes, std::uint32_t size) {
  runGuarded(context_, [&] {
    const auto result = partial_command_.feed(std::string_view(bytes, size));
    if (result.appended) LMPLogMessage(context_.log(), kLogDebug, "Appending to existing partial command");
    if (result.dropped) {
      LMPLogMessage(context_.log(), kLogError, "Command of more than %zu bytes without an end dropped",
                    kPartialCommandLimit);
    }
    if (!result.line) return;
    if (const auto text = commandFromReceivedData(*result.line))
      dispatcher_.execute(std::string(trimLineBreaks(*text)), !requiresAuthentication());
  });
}

void AgentControlBase::sendReply(const std::string& reply) {
  const auto connection = sockets_.replyTarget();
  if (connection == 0) return logNobodyToReplyTo(reply);
  if (thread_.isCurrent()) {
    deliver(reply);
  } else if (!outbox_.push({reply, connection})) {
    context_.logDebug("Too many replies wait for the peer, one is dropped: " + reply);
  }
}

void AgentControlBase::logNobodyToReplyTo(const std::string& reply) const {
  context_.logDebug("Nobody to send the reply to: " + reply);
}

/// Sends what other threads have answered. A peer that takes no more loses the rest: each reply might keep
/// the thread for the whole limit.
void AgentControlBase::flushReplies() {
  bool taken = true;
  for (const auto& [reply, connection] : outbox_.takeAll()) {
    if (taken && connection == sockets_.replyTarget()) {
      runGuarded(context_, [&, &text = reply] { taken = deliver(text); });
    } else {
      context_.logDebug("Reply dropped because its peer has gone, has lost its place or does not read: " +
                        reply);
    }
  }
}

void AgentControlBase::askToStop() {
  if (const auto context = context_.get(); context && !stop_announced_.exchange(true))
    LMPLogMessage(context->log_context(), kLogNotice, "Control module is stopping...");
  thread_.askToStop();
}

void AgentControlBase::stop() {
  askToStop();
  if (!context_.get()) {  // the channel has stopped itself before
    if (!thread_.isCurrent()) thread_.waitUntilEnded();
    return;
  }
  if (!thread_.isCurrent() && thread_.waitUntilEnded()) {
    sockets_.closeAll();  // a peer that still saw the old connection open would count two channels after a
                          // restart
    return;
  }
  disconnect();
  context_.release();
}

void AgentControlBase::disconnect() {
  context_.logInfo("Disconnecting from tunnel...");
  sockets_.closeCurrent();
}

void AgentControlBase::disconnectOld() {
  context_.logInfo("Disconnecting from tunnel...");
  sockets_.closePrevious();
}

}  // namespace lmx

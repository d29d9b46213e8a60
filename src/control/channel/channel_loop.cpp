// The thread's loop: connect with back-off, receive until the connection is gone, reconnect.
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <chrono>

#include "control/channel/agent_control_base.h"
#include "control/channel/back_off.h"
#include "platform/net/socket_io.h"
#include "record/agent_record.h"
#include "support/format.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr std::int64_t kContactLostMilliseconds = 600001;
constexpr auto kReceiveWait = 2s;

}  // namespace

bool contactIsLost(const TimeValue& now, const TimeValue& lastContact) {
  return lmp_diff_timeval(now, lastContact) >= kContactLostMilliseconds;
}

int AgentControlBase::run() {
  while (running_ && connectWithBackOff()) {
    // Only now, when the new connection exists: a server never sees the agent without any.
    disconnectOld();
    receiveUntilGone();
    serverSocketDumped_ = serverSocket_.exchange(-1);
  }
  return 0;
}

/// @return false when the channel is to stop.
bool AgentControlBase::connectWithBackOff() {
  for (auto delay = kFirstBackOff; serverSocket_ == -1;) {
    if (!running_) return false;
    if (connect() != 1) continue;
    logInfo(string_with_format("Failed to connect to server, retrying in %d seconds.",
                               static_cast<int>(delay.count())));
    if (running_) clock_.sleep(delay, wakeDescriptor(), previousPeerIfAlive());  // a stop ends it at once
    if (takeBackPreviousPeer()) break;
    delay = nextBackOff(delay);
  }
  return true;
}

void AgentControlBase::receiveUntilGone() {
  peer_has_gone_ = false;
  while (running_) {
    if (networkHasChanged() || lastContactTimedOut()) return;
    if (!waitForPacket()) {
      peer_has_gone_ = true;
      return;
    }
  }
}

bool AgentControlBase::networkHasChanged() {
  auto changed = netTransitionTime_.load();
  if (changed <= 0) return false;
  const auto now = clock_.now();
  if (!now || now->tv_sec <= changed) return false;
  // A change that is reported right now keeps its place.
  netTransitionTime_.compare_exchange_strong(changed, 0);
  logDebug("The connection is made anew after a network change");
  return true;
}

bool AgentControlBase::lastContactTimedOut() {
  const auto session = this->session();
  const auto last = session ? session->lastContact.get() : std::nullopt;
  if (!last) return false;
  const auto now = clock_.now();
  if (!now || !contactIsLost(*now, *last)) return false;
  session->lastContact.set(std::nullopt);
  LMPLogMessage(logContext(), kLogNotice, "Too long since last contact from server.  Reconnecting...");
  return true;
}

/// @return false when the connection is gone.
bool AgentControlBase::waitForPacket() {
  const int socket = serverSocket_;
  if (socket == -1) return false;
  auto readiness = awaitReadable(socket, wakeDescriptor(), kReceiveWait);
  while (readiness == Readiness::interrupted && running_) {
    clock_.sleep(1ms, wakeDescriptor());
    readiness = awaitReadable(socket, wakeDescriptor(), kReceiveWait);
  }
  if (readiness == Readiness::readable && running_) return receivePacket(socket);
  return readiness != Readiness::badDescriptor;
}

bool AgentControlBase::receivePacket(int socket) {
  std::array<char, 1024> buffer{};
  const ssize_t received = ::recv(socket, buffer.data(), buffer.size(), MSG_DONTWAIT);
  if (received == 0) return connected();
  if (received < 0) return errno != EBADF && errno != ECONNRESET && errno != ETIMEDOUT;
  packetReceived(buffer.data(), static_cast<std::uint32_t>(received));
  return true;
}

/// The socket of a previous peer that may still say something, else -1.
int AgentControlBase::previousPeerIfAlive() const {
  const int socket = serverSocketDumped_;
  return socket != -1 && peerIsConnected(socket) ? socket : -1;
}

/// Puts the previous peer in its place again if it has said something: one that lost it to a change of the
/// network, or to ten minutes without a command, knows nothing of that, and its STOP must not be lost.
/// @return whether it has
bool AgentControlBase::takeBackPreviousPeer() {
  char next = 0;
  if (::recv(serverSocketDumped_, &next, 1, MSG_PEEK | MSG_DONTWAIT) <= 0) return false;
  previousPeerSpeaks();
  logDebug("The previous peer speaks again");
  setServerSocket(serverSocketDumped_.exchange(-1));
  return true;
}

int AgentControlBase::acceptPeer(int listening) {
  int previous = serverSocketDumped_;
  Readiness readiness = Readiness::interrupted;
  while (readiness == Readiness::interrupted || readiness == Readiness::otherReadable) {
    readiness = awaitReadable(listening, wakeDescriptor(), -1ms, previous);
    if (readiness != Readiness::otherReadable) continue;
    if (takeBackPreviousPeer()) return 0;
    previous = -1;  // it has gone
  }
  if (readiness == Readiness::woken) return -1;

  const int peer = ::accept4(listening, nullptr, nullptr, SOCK_CLOEXEC);
  const int error = errno;
  setServerSocket(peer);
  logInfo(string_with_format("accepted connection fd = %d from listen fd = %d", peer, listening));
  if (peer == -1) {
    // The peer stays in the queue while the machine has no descriptor for it: don't spin on that.
    if (error == EMFILE || error == ENFILE || error == ENOBUFS || error == ENOMEM) {
      clock_.sleep(100ms, wakeDescriptor());
    }
    return -1;
  }
  const int on = 1;
  return ::setsockopt(listening, SOL_SOCKET, SO_KEEPALIVE, &on, sizeof on) == 0 ? 0 : -1;
}

}  // namespace lmx

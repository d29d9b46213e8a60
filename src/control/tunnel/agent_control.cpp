// Connecting to the server, the hello, and encrypted lines.
#include "control/tunnel/agent_control.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <vector>

#include "control/channel/back_off.h"
#include "control/channel/plain_text.h"
#include "control/tunnel/cluster_hosts.h"
#include "control/tunnel/hello.h"
#include "platform/net/connect_multiple.h"
#include "platform/net/socket_io.h"
#include "support/base64.h"
#include "support/format.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

constexpr const char* kRejected = "ERR Unbound agent";
constexpr int kHelloNotSent = 24;
constexpr int kNotConnected = 1;
/// The hello fits into any buffer: a server that has not taken it after so long never will.
constexpr std::chrono::seconds kHelloLimit{5};

CipherBlock newVector() {
  CipherBlock vector{};
  const std::string random = agent_random_bytes(vector.size());
  std::copy(random.begin(), random.end(), vector.begin());
  return vector;
}

/// @param members  of the server's cluster; null when none are known
std::vector<std::string> hostsToTry(const PlistDictionary* members, const ServerSettings& server) {
  std::vector<std::string> hosts = clusterHostArray(members);
  if (hosts.empty()) hosts.push_back(server.tunnel_host.get().value_or(""));
  return hosts;
}

}  // namespace

AgentControl::AgentControl(std::shared_ptr<AgentContext> context, AgentActions* actions, ChannelClock& clock)
    : AgentControlBase(ChannelKind::tunnel, std::move(context), actions, clock),
      initialization_vector_(newVector()) {}

AgentControl::~AgentControl() { stop(); }

/// A server that accepts and hangs up, whatever it says in between, would otherwise be called hundreds of
/// times a second.
bool AgentControl::wasDroppedAtOnce() const {
  return peerHasGone() && connected_at_ && clock().steadyNow() - *connected_at_ < kFirstBackOff;
}

/// Has the system find out that a silent server is gone: local commands count as contact too, so the
/// channel's own time-out may never come.
void AgentControl::watchPeer() {
  const auto set = [this](int level, int option, int value) {
    ::setsockopt(sockets().current(), level, option, &value, sizeof value);
  };
  set(SOL_SOCKET, SO_KEEPALIVE, 1);
  set(IPPROTO_TCP, TCP_KEEPIDLE, 60);
  set(IPPROTO_TCP, TCP_KEEPINTVL, 15);
  set(IPPROTO_TCP, TCP_KEEPCNT, 4);
  set(IPPROTO_TCP, TCP_USER_TIMEOUT, 120'000);
}

int AgentControl::connect() {
  const auto agent = context().get();
  if (!agent) return kNotConnected;
  if (wasDroppedAtOnce()) {
    connected_at_ = std::nullopt;
    context().logDebug("The server has closed the last connection within 5 seconds");
    return kNotConnected;
  }
  context().logInfo("Connecting to lmxserverd tunnel at " + textOrNull(agent->server.tunnel_host.get()) +
                    ":" + textOrNull(agent->server.tunnel_port.get()));
  disconnect();
  int socket = -1;
  const std::string port = agent->server.tunnel_port.get().value_or("");
  const auto members = agent->server_info.get();
  if (lmp_connect_multiple(hostsToTry(members.get(), agent->server), port, &socket, wakeDescriptor()) == -1)
    return kNotConnected;
  sockets().setCurrent(UniqueFd(socket), Greeting::comesFirst);
  connected_at_ = clock().steadyNow();
  watchPeer();
  logPeer(agent->server);
  if (sendAGENT() == 0) return 0;
  disconnect();
  return kNotConnected;
}

/// Only an IPv4 peer has its address in the line; for any other the configured names stand.
void AgentControl::logPeer(const ServerSettings& server) {
  sockaddr_in peer{};
  socklen_t size = sizeof peer;
  char address[INET_ADDRSTRLEN] = "";
  if (getpeername(sockets().current(), reinterpret_cast<sockaddr*>(&peer), &size) == 0 &&
      peer.sin_family == AF_INET && inet_ntop(AF_INET, &peer.sin_addr, address, sizeof address) != nullptr) {
    LMPLogMessage(context().log(), kLogInfo, "Connected to %s:%d", address, ntohs(peer.sin_port));
  } else {
    LMPLogMessage(context().log(), kLogInfo, "Connected to %s:%s",
                  textOrNull(server.tunnel_host.get()).c_str(), textOrNull(server.tunnel_port.get()).c_str());
  }
}

int AgentControl::sendAGENT() {
  const auto agent = context().get();
  if (!agent) return kNotConnected;
  context().logDebug("Sending AGENT information...");
  const auto hello = [&agent](const std::string& vector) {
    return helloLine(agent->server.machine_uuid.get(), vector, agent->state.running.get());
  };
  const std::string vector = lmp_encode_base64(
      {reinterpret_cast<const char*>(initialization_vector_.data()), initialization_vector_.size()});
  const int error = sendWhole(sockets().current(), hello(vector), kHelloLimit, wakeDescriptor());
  if (error != 0)
    context().logDebug(string_with_format("Could not send AGENT to tunnel (errno = %d)", error));
  if (error == 0) sockets().setGreeted();
  agent->state.agent_sent_or_fail.set(true);
  context().logInfo("Sent: " + hello("*"));
  return error == 0 ? 0 : kHelloNotSent;
}

std::optional<std::string> AgentControl::commandFromReceivedData(const std::string& line) {
  const auto agent = context().get();
  const auto secret = agent ? agent->server.shared_secret.get() : std::nullopt;
  if (secret) {
    const auto plaintext = agent_decrypt_message(initialization_vector_, *secret, line);
    if (plaintext) return plainCommand(messageIn(*plaintext), context().log());
  }
  // To the byte: a refusal in one piece still has its line feed and is taken for noise. Servers have come to
  // rely on that.
  if (line == kRejected) serverRejected();
  return std::nullopt;
}

void AgentControl::serverRejected() {
  LMPLogMessage(context().log(), kLogWarning, "Server rejected agent connection, sleeping for one minute.");
  if (const auto agent = context().get()) agent->state.serverRejectTime.set(std::time(nullptr));
  endAfterThisCommand();
}

void AgentControl::logNobodyToReplyTo(const std::string& reply) const {
  context().logDebug("No reply before the hello: " + reply);
}

bool AgentControl::deliver(const std::string& reply) {
  const auto agent = context().get();
  const auto secret = agent ? agent->server.shared_secret.get() : std::nullopt;
  if (!secret) return true;
  const auto text =
      agent_encrypt_message(initialization_vector_, *secret, agent_random_bytes(kRandomPrefix).append(reply));
  if (!text) return true;
  const int error = sendWhole(sockets().current(), *text + "\n", kReplyLimit, wakeDescriptor());
  if (error == 0) return true;
  context().logDebug(string_with_format("Could not answer to tunnel (errno = %d)", error));
  // Half a line would garble the next reply: the connection is of no use any more.
  if (error == ETIMEDOUT) ::shutdown(sockets().current(), SHUT_RDWR);
  return false;
}

}  // namespace lmx

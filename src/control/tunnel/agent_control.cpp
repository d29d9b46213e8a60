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
#include "platform/net/connect_multiple.h"
#include "platform/net/socket_io.h"
#include "support/base64.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr double kProtocolVersion = 100;
constexpr const char* kRejected = "ERR Unbound agent";
constexpr int kHelloNotSent = 24;
constexpr int kNotConnected = 1;
/// A server that takes nothing for so long has lost what we say.
constexpr std::chrono::seconds kSendPatience{5};

CipherBlock newVector() {
  CipherBlock vector{};
  const std::string random = agent_random_bytes(vector.size());
  std::copy(random.begin(), random.end(), vector.begin());
  return vector;
}

std::vector<std::string> hostsToTry(const AgentContext& context) {
  std::vector<std::string> hosts = clusterHostArray(context.server_info.get().get());
  if (hosts.empty()) hosts.push_back(context.server.tunnel_host.get().value_or(""));
  return hosts;
}

}  // namespace

AgentControl::AgentControl(std::shared_ptr<AgentContext> context, AgentActions* actions, ChannelClock& clock)
    : AgentControlBase(std::move(context), actions, clock), initialization_vector_(newVector()) {}

AgentControl::~AgentControl() { stop(); }

/// A server that accepts and hangs up would otherwise be called ten thousand times a second.
bool AgentControl::wasDroppedAtOnce() const {
  return peerHasGone() && connected_at_ && !spoken_to_ &&
         std::chrono::steady_clock::now() - *connected_at_ < kFirstBackOff;
}

/// Has the system find out that a silent server is gone: local commands count as contact too, so the
/// channel's own time-out may never come.
void AgentControl::watchPeer() {
  const auto set = [this](int level, int option, int value) {
    ::setsockopt(serverSocket(), level, option, &value, sizeof value);
  };
  set(SOL_SOCKET, SO_KEEPALIVE, 1);
  set(IPPROTO_TCP, TCP_KEEPIDLE, 60);
  set(IPPROTO_TCP, TCP_KEEPINTVL, 15);
  set(IPPROTO_TCP, TCP_KEEPCNT, 4);
  set(IPPROTO_TCP, TCP_USER_TIMEOUT, 120'000);
}

int AgentControl::connect() {
  const auto context = agentContext();
  if (!context) return kNotConnected;
  if (wasDroppedAtOnce()) {
    connected_at_ = std::nullopt;
    logDebug("The server has closed the last connection without a word");
    return kNotConnected;
  }
  const std::string port = context->server.tunnel_port.get().value_or("");
  logInfo("Connecting to lmxserverd tunnel at " + context->server.tunnel_host.get().value_or("(null)") + ":" +
          port);
  hello_sent_ = false;
  disconnect();
  int socket = -1;
  if (lmp_connect_multiple(hostsToTry(*context), port, &socket, wakeDescriptor()) == -1) return kNotConnected;
  setServerSocket(socket);
  connected_at_ = std::chrono::steady_clock::now();
  spoken_to_ = false;
  watchPeer();
  logPeer();
  if (sendAGENT() == 0) return 0;
  disconnect();
  return kNotConnected;
}

/// Only an IPv4 peer has its address in the line; for any other the configured names stand.
void AgentControl::logPeer() {
  const auto context = agentContext();
  sockaddr_in peer{};
  socklen_t size = sizeof peer;
  char address[INET_ADDRSTRLEN] = "";
  if (getpeername(serverSocket(), reinterpret_cast<sockaddr*>(&peer), &size) == 0 &&
      peer.sin_family == AF_INET && inet_ntop(AF_INET, &peer.sin_addr, address, sizeof address) != nullptr) {
    LMPLogMessage(logContext(), kLogInfo, "Connected to %s:%d", address, ntohs(peer.sin_port));
  } else {
    LMPLogMessage(logContext(), kLogInfo, "Connected to %s:%s",
                  context->server.tunnel_host.get().value_or("").c_str(),
                  context->server.tunnel_port.get().value_or("").c_str());
  }
}

std::string AgentControl::hello(const AgentContext& context, const std::string& vectorText) {
  return "AGENT protocol=1,agent_uuid=" + context.server.machine_uuid.get().value_or("(null)") +
         ",iv=" + vectorText + string_with_format(",version=%.0f", kProtocolVersion) +
         (context.state.running.get() ? "" : ",agent_recording_status=offline") + "\n";
}

int AgentControl::sendAGENT() {
  const auto context = agentContext();
  if (!context) return kNotConnected;
  logDebug("Sending AGENT information...");
  const std::string vector = lmp_encode_base64(
      {reinterpret_cast<const char*>(initialization_vector_.data()), initialization_vector_.size()});
  const int error = sendWhole(serverSocket(), hello(*context, vector), kSendPatience, wakeDescriptor());
  if (error != 0) logDebug(string_with_format("Could not send AGENT to tunnel (errno = %d)", error));
  hello_sent_ = error == 0;
  context->state.agent_sent_or_fail.set(true);
  logInfo("Sent: " + hello(*context, "*"));
  return error == 0 ? 0 : kHelloNotSent;
}

std::optional<std::string> AgentControl::commandFromReceivedData(const std::string& line) {
  const auto context = agentContext();
  const auto secret = context ? context->server.shared_secret.get() : std::nullopt;
  if (secret) {
    const auto plaintext = agent_decrypt_message(initialization_vector_, *secret, line);
    spoken_to_ = spoken_to_ || plaintext;
    if (plaintext) return plainCommand(messageIn(*plaintext), logContext());
  }
  // To the byte: a refusal in one piece still has its line feed and is taken for noise. Servers have come to
  // rely on that.
  if (line == kRejected) serverRejected();
  return std::nullopt;
}

void AgentControl::serverRejected() {
  LMPLogMessage(logContext(), kLogWarning, "Server rejected agent connection, sleeping for one minute.");
  if (const auto context = agentContext()) context->state.serverRejectTime.set(std::time(nullptr));
  askToStop();
}

void AgentControl::sendReply(const std::string& reply) {
  const auto context = agentContext();
  const auto secret = context ? context->server.shared_secret.get() : std::nullopt;
  const std::lock_guard lock(sendMutex());
  if (!hello_sent_) return logDebug("No reply before the hello: " + reply);
  if (!secret) return;
  const auto text = agent_encrypt_message(initialization_vector_, *secret,
                                          agent_random_bytes(kRandomPrefix).append(plainReplyBytes(reply)));
  if (!text) return;
  const int error = sendWhole(serverSocket(), *text + "\n", kSendPatience, wakeDescriptor());
  if (error == 0) return;
  logDebug(string_with_format("Could not answer to tunnel (errno = %d)", error));
  // Half a line would garble the next reply: the connection is of no use any more.
  if (error == ETIMEDOUT) ::shutdown(serverSocket(), SHUT_RDWR);
}

}  // namespace lmx

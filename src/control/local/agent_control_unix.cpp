// The local control socket: commands of local tools, in plain text, from one peer at a time.
#include "control/local/agent_control_unix.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "control/channel/plain_text.h"
#include "platform/net/local_socket.h"
#include "platform/paths.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr int kBacklog = 1024;

}  // namespace

AgentControlUnix::~AgentControlUnix() {
  cleanup();
  stop();
  cleanup();  // the thread may have made the file only now
}

void AgentControlUnix::cleanup() {
  const std::string path = socket_path_.exchange({});
  if (!path.empty()) ::unlink(path.c_str());
}

int AgentControlUnix::run() {
  // Nobody listens behind this function, however it is left.
  const struct AtEnd {
    AgentControlUnix& channel;
    ~AtEnd() {
      channel.acceptor_.close();
      channel.localDomainSocket_.reset();
      channel.cleanup();
    }
  } at_end{*this};
  const int listening = localConnect();
  if (listening != 0 && running()) {
    LMPLogMessage(context().log(), kLogError, "The local control socket %s could not be set up: %s",
                  systemPath(kLocalSocket).c_str(), std::strerror(listening));
  }
  return listening == 0 ? AgentControlBase::run() : -1;
}

/// Sets up the listener and waits for the first peer. @return 0, or the errno of the set-up.
int AgentControlUnix::localConnect() {
  context().logInfo("Connecting local pipe");
  const std::string path = systemPath(kLocalSocket);
  const auto address = localSocketAddress(path);
  if (!address) return ENAMETOOLONG;
  localDomainSocket_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!localDomainSocket_.valid()) return errno;
  const int on = 1;
  ::setsockopt(localDomainSocket_.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  ::setsockopt(localDomainSocket_.get(), SOL_SOCKET, SO_REUSEPORT, &on, sizeof on);

  ::unlink(path.c_str());  // left by an agent that was killed
  if (::bind(localDomainSocket_.get(), reinterpret_cast<const sockaddr*>(&*address), sizeof *address) != 0)
    return errno;
  socket_path_.set(path);
  if (::listen(localDomainSocket_.get(), kBacklog) != 0) return errno;
  acceptor_.listenOn(localDomainSocket_.get());
  localAccept();  // a peer that could not be taken on is the next turn's business
  return 0;
}

std::optional<std::string> AgentControlUnix::commandFromReceivedData(const std::string& line) {
  return plainCommand(line, context().log());
}

bool AgentControlUnix::deliver(const std::string& reply) {
  const int error = sendPlainReply(sockets().current(), reply, wakeDescriptor());
  if (error == 0) return true;
  context().logDebug(string_with_format("Could not answer to tunnel (errno = %d)", error));
  // Half a reply would garble the next, and each might keep the others waiting for as long.
  if (error == ETIMEDOUT) ::shutdown(sockets().current(), SHUT_RDWR);
  return false;
}

}  // namespace lmx

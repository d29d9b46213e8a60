// The client's side of one command.
#include "control/local/client_connect.h"

#include <sys/socket.h>

#include <cerrno>
#include <chrono>

#include "platform/net/local_socket.h"
#include "platform/net/socket_io.h"
#include "platform/paths.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

constexpr std::size_t kReplyLimit = 1023;
constexpr std::chrono::seconds kSendPatience{30};
constexpr auto kAskEvery = 100ms;
constexpr int kNoWakeDescriptor = -1;

/// @return 0 when a reply can be received, -1 when the descriptor is of no use, 1 when the patience ended.
int awaitReply(int socket, const ClientConnect::Patience& patience) {
  for (;;) {
    const Readiness readiness = awaitReadable(socket, kNoWakeDescriptor, kAskEvery);
    if (readiness == Readiness::readable) return 0;
    if (readiness == Readiness::badDescriptor || readiness == Readiness::failed) return -1;
    if (!patience()) return 1;
  }
}

}  // namespace

int ClientConnect::connect() {
  const auto address = localSocketAddress(systemPath(kLocalSocket));
  if (!address) return -1;
  sock_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!sock_.valid()) return -1;
  int result = 0;
  do {
    result = ::connect(sock_.get(), reinterpret_cast<const sockaddr*>(&*address), sizeof *address);
  } while (result != 0 && errno == EINTR);
  return result == 0 ? 0 : -1;
}

int ClientConnect::execCommand(const std::string& command, std::string* response, const Patience& patience) {
  if (!sock_.valid() || sendWhole(sock_.get(), command, kSendPatience, kNoWakeDescriptor) != 0) return -1;
  std::string reply(kReplyLimit, '\0');
  const int waited = awaitReply(sock_.get(), patience);
  if (waited < 0) return -1;
  const ssize_t size = waited == 0 ? ::recv(sock_.get(), reply.data(), reply.size(), 0) : 0;
  if (size < 0) return -1;
  reply.resize(static_cast<std::size_t>(size));
  if (response != nullptr) *response = std::move(reply);
  return 0;
}

}  // namespace lmx

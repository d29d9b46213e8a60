// Sending datagrams to "/dev/log".
#include "platform/log_socket.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <cerrno>
#include <cstring>

#include "platform/paths.h"

namespace lmx {
namespace {

constexpr std::chrono::seconds kReconnectInterval{1};

UniqueFd connectToLog() {
  const std::string path = systemPath(kLogSocket);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) return {};
  std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
  UniqueFd fd(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!fd.valid()) return {};
  if (::connect(fd.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) return {};
  return fd;
}

enum class Sent { yes, full, gone };

Sent sendOnce(int socket, std::string_view datagram) {
  for (;;) {
    if (::send(socket, datagram.data(), datagram.size(), MSG_DONTWAIT | MSG_NOSIGNAL) >= 0) return Sent::yes;
    switch (errno) {
      case EINTR:
        continue;
      case EAGAIN:
      case ENOBUFS:
      case ENOMEM:
      case EMSGSIZE:
        return Sent::full;
      default:
        return Sent::gone;
    }
  }
}

}  // namespace

void LogSocket::connect() { socket_ = connectToLog(); }

void LogSocket::send(std::string_view datagram,
                     const std::function<std::string(const std::string& text)>& lostNotice) {
  if (lost_ > 0 && deliver(lostNotice(std::to_string(lost_) + " messages lost"))) lost_ = 0;
  // Sending this message without the notice before it would hide the gap.
  if (lost_ > 0 || !deliver(datagram)) ++lost_;
}

/// Connects unless the last failure was less than a second ago.
bool LogSocket::ensureConnected() {
  if (socket_.valid()) return true;
  const auto now = std::chrono::steady_clock::now();
  if (now < next_attempt_) return false;
  socket_ = connectToLog();
  if (!socket_.valid()) next_attempt_ = now + kReconnectInterval;
  return socket_.valid();
}

/// Sends, connecting anew once when the log daemon has been restarted.
bool LogSocket::deliver(std::string_view datagram) {
  for (int attempt = 0; attempt < 2; ++attempt) {
    if (!ensureConnected()) return false;
    switch (sendOnce(socket_.get(), datagram)) {
      case Sent::yes:
        return true;
      case Sent::full:
        return false;
      case Sent::gone:
        socket_.reset();
        break;
    }
  }
  next_attempt_ = std::chrono::steady_clock::now() + kReconnectInterval;
  return false;
}

}  // namespace lmx

// Builds Unix-domain socket addresses.
#include "platform/net/local_socket.h"

#include <sys/socket.h>

namespace lmx {

std::optional<sockaddr_un> localSocketAddress(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) return std::nullopt;
  path.copy(address.sun_path, path.size());
  return address;
}

}  // namespace lmx

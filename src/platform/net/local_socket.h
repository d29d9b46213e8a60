// Where the local control socket is.
#pragma once
#include <sys/un.h>

#include <optional>
#include <string>

namespace lmx {

/// The address of the socket file `path`; nothing when it is too long: cut off it would name another file.
std::optional<sockaddr_un> localSocketAddress(const std::string& path);

}  // namespace lmx

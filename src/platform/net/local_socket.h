// Unix-domain socket addresses.
#pragma once
#include <sys/un.h>

#include <optional>
#include <string>

namespace lmx {

/// The address of the socket file `path`; nothing when the path is too long. Truncated, it would name another
/// file.
std::optional<sockaddr_un> localSocketAddress(const std::string& path);

}  // namespace lmx

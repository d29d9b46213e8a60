// TCP connect to the first reachable of several hosts.
#pragma once
#include <string>
#include <vector>

namespace lmx {

/// Tries `hosts` in order and stores the first connected stream socket in `*socketOut`.
/// An entry is "host", "host:port", "[v6]" or "[v6]:port"; an entry's own port wins over `port`.
/// At most 10 s a host, all its addresses together. Blocks; call it off the main thread. Thread-safe.
/// @param port  decimal text
/// @param wake  descriptor that ends the attempts when it is readable; negative: none
/// @return 0 when connected; -1 when no host could be reached (`*socketOut` is then -1).
int lmp_connect_multiple(const std::vector<std::string>& hosts, const std::string& port, int* socketOut,
                         int wake = -1);

}  // namespace lmx

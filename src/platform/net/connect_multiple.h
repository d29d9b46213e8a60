// Connects over TCP to the first reachable of several hosts.
#pragma once
#include <string>
#include <vector>

namespace lmx {

/// Tries `hosts` in order and stores the first connected stream socket in `*socketOut`. An entry is "host",
/// "host:port", "[v6]" or "[v6]:port"; a port in the entry overrides `port`. Spends at most 10 s on each
/// host, all its addresses included. Blocks; call it off the main thread. Thread-safe.
/// @param port  decimal text
/// @param wake  descriptor that ends the attempts when it becomes readable; negative: none
/// @return 0 when connected; -1 when no host could be reached (`*socketOut` is then -1)
int lmp_connect_multiple(const std::vector<std::string>& hosts, const std::string& port, int* socketOut,
                         int wake = -1);

}  // namespace lmx

// Sends whole replies and waits for descriptors without getting stuck on a peer.
#pragma once
#include <chrono>
#include <span>
#include <string_view>

namespace lmx {

/// Sends all of `bytes` on the stream `socket`, usually in one call of send. Raises no SIGPIPE.
/// @param limit  for the whole send. A peer that reads slowly has all of it: nothing is shorter.
/// @param wake  descriptor that ends the wait when it becomes readable; negative: none
/// @return 0, or the errno of the failure: ETIMEDOUT when the time ran out, ECANCELED when `wake` ended the
/// wait.
/// After a failure part of the bytes may have been sent.
int sendWhole(int socket, std::string_view bytes, std::chrono::milliseconds limit, int wake);

/// Outcome of waiting for a readable descriptor.
enum class Readiness {
  readable,       ///< data, end of stream or a pending error
  otherReadable,  ///< the same for one of `others`, which have priority
  timedOut,
  woken,        ///< `wake` is readable
  interrupted,  ///< interrupted by a signal
  badDescriptor,
  failed,
};

/// Waits once until `descriptor` or one of `others` is readable. Negative descriptors count as none.
/// @param limit  negative: no limit
Readiness awaitReadable(int descriptor, int wake, std::chrono::milliseconds limit,
                        std::span<const int> others = {});

/// Whether `descriptor` has data, the end of a stream or an error to report. Never waits.
bool isReadable(int descriptor);

/// Whether the peer of `socket` is connected: it has neither hung up nor shut down its sending side. Linux
/// reports the latter only as POLLRDHUP; without it a closed peer would look connected for ever.
bool peerIsConnected(int socket);

}  // namespace lmx

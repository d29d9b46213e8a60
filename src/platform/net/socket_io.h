// Sending whole replies and waiting for descriptors without getting stuck on a peer.
#pragma once
#include <chrono>
#include <string_view>

namespace lmx {

/// Sends all of `bytes` on the stream `socket`, usually with one send. A peer that is gone raises no SIGPIPE.
/// @param patience  longest wait without the peer taking a single byte; six of them is the longest in all
/// @param wake  descriptor that ends the wait when it becomes readable; negative: none
/// @return 0, or the errno of the failure: ETIMEDOUT when the patience ran out, ECANCELED when `wake` ended
/// it.
///         A part of the bytes may then have been sent.
int sendWhole(int socket, std::string_view bytes, std::chrono::milliseconds patience, int wake);

/// What a wait for a readable descriptor came to.
enum class Readiness {
  readable,       ///< data, end of stream or an error to fetch
  otherReadable,  ///< the same of `other`; it comes first
  timedOut,
  woken,        ///< `wake` is readable
  interrupted,  ///< a signal came first
  badDescriptor,
  failed,
};

/// Waits once until `descriptor` or `other` is readable.
/// @param limit  negative: no limit
/// @param other  negative: none
Readiness awaitReadable(int descriptor, int wake, std::chrono::milliseconds limit, int other = -1);

/// Whether the peer of `socket` is still there: it has neither hung up nor closed its sending side.
/// Linux reports the latter as POLLRDHUP only, so without it a closed peer would look connected for ever.
bool peerIsConnected(int socket);

}  // namespace lmx

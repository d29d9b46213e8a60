// The marks of a capture's requests: when is something to be recorded, and for whom? Pure.
#pragma once
#include <limits>
#include <map>
#include <string>
#include <vector>

#include "support/dictionary.h"

namespace lmx {

/// Half-open, in seconds of the capture session's running time, which no step of the wall clock moves.
struct Span {
  double start = 0;
  double stop = std::numeric_limits<double>::infinity();
  [[nodiscard]] bool open() const { return stop == std::numeric_limits<double>::infinity(); }
  [[nodiscard]] bool contains(double t) const { return t >= start && t < stop; }
  bool operator==(const Span&) const = default;
};

/// Seconds that two ascending lists of spans have in common before `now`.
double commonSeconds(const std::vector<Span>& a, const std::vector<Span>& b, double now);

struct Request {
  std::string uuid;
  SharedDictionary parameters;  ///< never null
  std::vector<Span> spans;      ///< ascending
  bool cancelled = false;
  bool done = false;  ///< handed over: movie and document are in place

  [[nodiscard]] bool wanted(double t) const;
  /// Neither cancelled nor handed over.
  [[nodiscard]] bool pending() const { return !cancelled && !done; }
};

/// Not thread-safe; its owner locks.
class RequestMarks {
 public:
  /// Opens a span. A request that is open already stays as it is. A start before the end of the last span
  /// counts from there.
  void start(const std::string& uuid, double t, SharedDictionary parameters);
  /// Closes the open span, or cuts the last one shorter; never before its start. An unknown request is
  /// ignored.
  void stop(const std::string& uuid, double t);
  void cancel(const std::string& uuid);
  void markDone(const std::string& uuid);
  void pause(double t);
  void resume(double t);
  [[nodiscard]] bool paused() const { return !pauses_.empty() && pauses_.back().open(); }

  /// Whether a frame of time `t` is to be recorded.
  [[nodiscard]] bool wanted(double t) const;
  /// Whether a span begins after `previous` and not after `t`: the frame must then stand by itself.
  [[nodiscard]] bool startsBetween(double previous, double t) const;
  /// Whether a request that began by `t` would get no frame at all unless this one is taken.
  [[nodiscard]] bool starving(double t) const;

  /// Recorded seconds of a request before `now`, pauses left out; 0 for an unknown one.
  [[nodiscard]] double elapsed(const std::string& uuid, double now) const;
  [[nodiscard]] const Request* find(const std::string& uuid) const;
  [[nodiscard]] const std::vector<Request>& requests() const { return requests_; }
  /// A request that is neither cancelled nor done, other than `uuid`.
  [[nodiscard]] bool othersPending(const std::string& uuid) const;

 private:
  Request* mutableFind(const std::string& uuid);
  std::vector<Request> requests_;
  std::vector<Span> pauses_;
};

}  // namespace lmx

// The marks of a capture's requests: what is to be recorded when, and for whom. Pure.
#pragma once
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "support/dictionary.h"

namespace lmx {

/// Half-open, in seconds of the pipeline's running time: a step of the wall clock does not move it.
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
  bool done = false;    ///< handed over: movie and document are in place
  bool submit = false;  ///< stopped for good, to be submitted
  bool queued = false;  ///< its submission is kept elsewhere

  [[nodiscard]] bool wanted(double t) const;
  /// Neither cancelled nor handed over.
  [[nodiscard]] bool pending() const { return !cancelled && !done; }
};

/// All times are running time in seconds. Not thread-safe; its owner locks.
class RequestMarks {
 public:
  /// Opens a span. Does nothing while the request has an open span, or once it is to be submitted. A start
  /// before the end of the last span counts from that end. `parameters` are kept with the first span only;
  /// null counts as empty.
  void start(const std::string& uuid, double t, SharedDictionary parameters);
  /// Closes the open span, or cuts the last one shorter; never before its start. An unknown request is
  /// ignored.
  void stop(const std::string& uuid, double t);
  /// Does nothing to a request that is to be submitted.
  void cancel(const std::string& uuid);
  void submit(const std::string& uuid);
  void markQueued(const std::string& uuid);
  void markDone(const std::string& uuid);
  void pause(double t);
  void resume(double t);
  [[nodiscard]] bool paused() const { return !pauses_.empty() && pauses_.back().open(); }

  /// Whether a frame of time `t` is to be recorded.
  [[nodiscard]] bool wanted(double t) const;
  /// The end, `t` at the latest, of what is to be recorded before `t`; nothing if there is nothing.
  [[nodiscard]] std::optional<double> wantedUntil(double t) const;
  /// Whether a span begins after `previous` and not after `t`. The frame at `t` must then be a key frame, so
  /// that the request's movie can begin with it.
  [[nodiscard]] bool startsBetween(double previous, double t) const;
  /// Whether a request has begun and ended by `t`. A movie that has no frame yet then takes the one at `t`,
  /// so that the request still gets a picture.
  [[nodiscard]] bool starving(double t) const;

  /// Recorded seconds of a request before `now`, pauses left out; 0 for an unknown one.
  [[nodiscard]] double elapsed(const std::string& uuid, double now) const;
  [[nodiscard]] const Request* find(const std::string& uuid) const;
  [[nodiscard]] const std::vector<Request>& requests() const { return requests_; }
  /// Whether a request other than `uuid` is neither cancelled nor done.
  [[nodiscard]] bool othersPending(const std::string& uuid) const;

 private:
  [[nodiscard]] Request* editable(const std::string& uuid);
  std::vector<Request> requests_;
  std::vector<Span> pauses_;
};

}  // namespace lmx

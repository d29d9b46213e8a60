// Keeps the marks of a running capture, writes them to its journal and decides when the capture ends.
#pragma once
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "capture/media/request_marks.h"
#include "capture/store/journal.h"

namespace lmx {

/// All times are running time in seconds. Thread-safe.
class CaptureMarks {
 public:
  enum class Ending { no, stop, cancel };

  explicit CaptureMarks(std::shared_ptr<Journal> journal) : journal_(std::move(journal)) {}

  // Once the capture has been closed, all of these do nothing.
  /// Opens a span of a request. Does nothing once the capture is ending.
  void start(const std::string& uuid, double t, const SharedDictionary& parameters);
  void stop(const std::string& uuid, double t);
  /// Does nothing to a request that is to be submitted.
  void cancel(const std::string& uuid);
  /// @return false once the capture has been closed
  bool submit(const std::string& uuid);
  void pause(double t);
  void resume(double t);
  /// Names the whole capture, from `t` on. The tag is no request: it records nothing and is not journalled.
  void tag(const std::string& uuid, double t);

  /// Ends the span of the tag, even if the capture has been closed.
  void untag(const std::string& uuid, double t);

  [[nodiscard]] bool paused() const;
  /// Recorded seconds of a request, or seconds since the tag, up to `now`; 0 for an unknown one.
  [[nodiscard]] double elapsed(const std::string& uuid, double now) const;

  /// Decides that the capture ends at `t`, or with its last mark if `t` is absent. Only the first call
  /// counts.
  /// @return whether this was the first
  bool end(Ending how, std::optional<double> t);
  /// Nothing until an end has been decided.
  [[nodiscard]] std::optional<double> endTime() const;
  [[nodiscard]] bool cancelled() const;
  /// Whether the capture has been cancelled and no request wants its movie: it can be discarded.
  [[nodiscard]] bool worthless() const;

  struct Wish {
    bool wanted = false;
    bool keyFrame = false;  ///< a request's movie begins with it
  };
  /// Whether the frame at `t` is to be recorded. @param previous  time of the one before it
  /// @param firstFrame  the movie has no frame yet: a request that has ended already takes this one
  [[nodiscard]] Wish wishAt(double previous, double t, bool firstFrame) const;
  /// The end, `t` at the latest, of what is to be recorded before `t`; nothing if there is nothing.
  [[nodiscard]] std::optional<double> wantedUntil(double t) const;

  /// Accepts no more marks. @return the final marks
  RequestMarks close();

 private:
  const std::shared_ptr<Journal> journal_;
  mutable std::mutex mutex_;
  RequestMarks marks_;          // guarded by mutex_
  std::string tag_;             // guarded by mutex_
  Span tag_span_;               // guarded by mutex_
  Ending ending_ = Ending::no;  // guarded by mutex_
  double end_time_ = 0;         // guarded by mutex_
  bool closed_ = false;         // guarded by mutex_
};

}  // namespace lmx

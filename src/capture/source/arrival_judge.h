// Tells sound that is late from sound that is missing. Pure.
#pragma once
#include <optional>

#include "capture/source/clock_filter.h"

namespace lmx {

/// Watches the stamps of a microphone's sound. Sound that comes late may be held up (it catches up) or there
/// may be sound missing before it (all that follows is as late); only what follows shows which. Not
/// thread-safe.
class ArrivalJudge {
 public:
  enum class Finding {
    undecided,  ///< hold the sound back for now; never for more than 0.8 s
    inTime,     ///< what is held back belongs to what was before
    jump,       ///< the clock begins anew with what is held back: at the start, after a gap, and when sound
                ///< comes faster than time passes. More may be missing behind punctual(): the stamps that
                ///< followed it are to be judged once more
  };
  /// Stamps ascend in `heard`; those that are judged once more need not.
  Finding judge(const SoundStamp& stamp);
  /// Begins anew with what is held back; `stamp` is taken for punctual.
  Finding startAgain(const SoundStamp& stamp);
  /// The stamp with which the clock began at the latest jump.
  [[nodiscard]] const SoundStamp& punctual() const { return punctual_; }
  [[nodiscard]] const ClockFilter& clock() const { return clock_; }

 private:
  struct Wait {
    SoundStamp earliest;    ///< relative to the clock
    double since = 0;       ///< running time of its first stamp, seconds
    double last_fall = 0;   ///< when sound last caught up
    bool starting = false;  ///< there is no clock yet
  };
  void beginWait(const SoundStamp& stamp, bool starting);
  Finding keepWaiting(const SoundStamp& stamp);

  ClockFilter clock_;
  std::optional<Wait> wait_;
  SoundStamp punctual_;
  bool running_ = false;
};

}  // namespace lmx

// Puts a network camera's picture and sound on the machine's clock.
#pragma once
#include <deque>
#include <mutex>
#include <optional>

namespace lmx {

/// Says when what a network camera sends was taken. The camera's own stamps say it exactly, but by the
/// camera's clock, which is off and may be set; arrival says it by the machine's clock, but only as well as
/// the network carries. So the stamps decide, and are brought in line with the earliest arrivals of the
/// latest seconds: what is late for a while, or comes all at once after a stall, keeps its place.
///
/// The picture leads and the sound is moved with it, since both have the camera's clock; sound alone leads
/// itself. Stamps that jump go on where they were. Thread-safe.
class StreamClock {
 public:
  enum class Stream { picture, sound };

  /// @param time  running time by the camera's stamps, seconds
  /// @param arrival  running time at which it was there; ascends, but for small differences of the streams
  /// @return running time by the machine's clock
  double place(Stream stream, double time, double arrival);

 private:
  /// Earliest arrival of each second, compared with the stamps.
  struct Second {
    double arrival = 0;
    double lateness = 0;
  };
  struct Part {
    std::deque<Second> seconds;
    double shift = 0;  ///< what the jumps of its stamps are made up for with
    std::optional<double> last_jump;
    double jumped_at = 0;  ///< arrival
  };
  void makeUpForJump(Part& part, const Part& other, double time, double arrival);
  static void observe(Part& part, double lateness, double arrival);
  static double usualLateness(const Part& part);
  void follow(const Part& lead, double arrival);

  std::mutex mutex_;
  Part picture_;                 // guarded by mutex_
  Part sound_;                   // guarded by mutex_
  std::optional<double> begun_;  // guarded by mutex_: when the leading part came first
  std::optional<double> right_;  // guarded by mutex_: lateness that needs no correction
  double followed_at_ = 0;       // guarded by mutex_
  double correction_ = 0;        // guarded by mutex_: seconds that are added to the stamps
};

}  // namespace lmx

// Plays a file in real time, over and over: when each of its pictures and sounds is due.
#pragma once
#include <condition_variable>
#include <mutex>
#include <optional>

namespace lmx {

/// Maps times in the file to running time. A round begins where the longest track of the round before ended.
/// A machine that is too slow for the file loses the time it is behind: what comes is always of now, like a
/// camera's. Thread-safe.
class FilePacer {
 public:
  /// Waits until what stands at `seconds` in the file, and lasts `duration` seconds, is due.
  /// @return its running time; nothing once interrupted
  [[nodiscard]] std::optional<double> wait(double seconds, double duration);
  /// The file begins again.
  void nextRound();
  /// Nobody waits from now on, until resume().
  void interrupt();
  void resume();
  /// Whether anything has come in this round.
  [[nodiscard]] bool played() const;

 private:
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::optional<double> round_start_;  // guarded by mutex_: running time of the file's beginning
  double round_length_ = 0;            // guarded by mutex_: so far, seconds
  bool interrupted_ = false;           // guarded by mutex_
};

}  // namespace lmx

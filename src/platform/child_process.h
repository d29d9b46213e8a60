// Runs child processes from an argument vector, never through a shell.
#pragma once
#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace lmx {

/// How a child ended.
struct ChildResult {
  enum class End {
    exited,      ///< `status` is its exit status
    signalled,   ///< `status` is the signal
    notStarted,  ///< `status` is the errno of the start
    timedOut,    ///< killed by us when the time limit was reached
    cancelled,   ///< killed by us, or not even started, because it was cancelled
  };
  End end = End::notStarted;
  int status = 0;
  std::string output;  ///< standard output, when captured

  [[nodiscard]] bool succeeded() const { return end == End::exited && status == 0; }
};

struct ChildOptions {
  bool captureOutput = false;                      ///< false: the child inherits the standard streams
  std::size_t maximumOutput = 16U << 20;           ///< bytes kept; further output is read and dropped
  std::optional<std::chrono::milliseconds> limit;  ///< none: wait indefinitely
  /// A descriptor that becomes readable when the child is to be killed, and stays so; -1: none. It outlives
  /// the run.
  int cancel = -1;
  std::chrono::milliseconds reportEvery{0};                     ///< > 0: call `stillRunning` at this interval
  std::function<void(std::chrono::milliseconds)> stillRunning;  ///< receives the time since the start
};

/// Starts children and waits for them. Tests use a scripted one.
class ChildRunner {
 public:
  virtual ~ChildRunner() = default;
  /// Runs argv[0] (an absolute path) with `argv` and blocks until the child ends. Thread-safe. The child gets
  /// default signal dispositions and an empty signal mask, and inherits no descriptors but the standard
  /// streams. Its output is read while it runs, so that a full pipe can't block it.
  virtual ChildResult run(const std::vector<std::string>& argv, const ChildOptions& options) = 0;
};

/// The real implementation (posix_spawn, pidfd). Lives as long as the process.
ChildRunner& systemChildRunner();

}  // namespace lmx

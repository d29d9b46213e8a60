// Child processes: started from an argument vector, never through a shell.
#pragma once
#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace lmx {

/// How a child came to its end.
struct ChildResult {
  enum class End {
    exited,      ///< `status` is its exit status
    signalled,   ///< `status` is the signal
    notStarted,  ///< `status` is the errno of the start
    timedOut,    ///< killed by us at the time limit
  };
  End end = End::notStarted;
  int status = 0;
  std::string output;  ///< standard output, when asked for

  [[nodiscard]] bool succeeded() const { return end == End::exited && status == 0; }
};

struct ChildOptions {
  bool captureOutput = false;                      ///< else the standard streams are inherited
  std::size_t maximumOutput = 16U << 20;           ///< bytes kept; the rest is read and dropped
  std::optional<std::chrono::milliseconds> limit;  ///< none: wait for ever
  std::chrono::milliseconds reportEvery{0};        ///< > 0: call `stillRunning` after each such span
  std::function<void(std::chrono::milliseconds)> stillRunning;  ///< with the time since the start
};

/// Starts children and waits for them; scripted in tests.
class ChildRunner {
 public:
  virtual ~ChildRunner() = default;
  /// Runs argv[0] (an absolute path) with `argv` and blocks until its end. Thread-safe. The child gets
  /// default signal dispositions and an empty signal mask, and none of our descriptors but the standard
  /// streams. Output is read while it runs, so that a full pipe can't stop it.
  virtual ChildResult run(const std::vector<std::string>& argv, const ChildOptions& options) = 0;
};

/// The real one (posix_spawn, pidfd). Lives as long as the process.
ChildRunner& systemChildRunner();

}  // namespace lmx

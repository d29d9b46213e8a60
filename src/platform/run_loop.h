// A run loop: timers, descriptors and posted actions, all run by the thread that calls run().
#pragma once
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>

namespace lmx {

enum class Wait { no, untilDone };

/// Built on its own queue, eventfd and poll instead of GLib's main context: the thread sanitizer can follow
/// these, and the main loop needs to handle exactly one source per turn.
class RunLoop {
 public:
  using Action = std::function<void()>;
  enum class Turn { handledSource, timedOut, stopped };

  RunLoop();
  ~RunLoop();
  RunLoop(const RunLoop&) = delete;
  RunLoop& operator=(const RunLoop&) = delete;

  /// Makes the calling thread the loop's owner. run() does so, too; call this first when actions are posted
  /// before the first turn.
  void adoptThread();

  /// Waits at most `limit` and returns after the first source handled: a posted action, a due timer or a
  /// ready descriptor. Posted actions come first, in order of posting. Owner thread only. May be nested in an
  /// action.
  Turn run(std::chrono::milliseconds limit);

  /// Runs `action` on the owner thread. Thread-safe. `untilDone` blocks the caller until it has run; on the
  /// owner thread it runs at once. Hold no lock that `action` may take.
  /// @return false when the loop has stopped and the action will not run
  bool post(Action action, Wait wait);

  /// Ends the loop: run() returns `stopped`, waiting posters return false, later posts are refused.
  /// Thread-safe.
  void stop();
  [[nodiscard]] bool isOwnerThread() const;

  /// Keeps a timer or a descriptor watch alive. Destroy it on the owner thread to remove it. Must not outlive
  /// the loop.
  class Source {
   public:
    virtual ~Source() = default;
  };
  /// Calls `action` every `interval` on the owner thread, first after one interval. Missed calls are not made
  /// up for.
  [[nodiscard]] std::unique_ptr<Source> addRepeatingTimer(std::chrono::milliseconds interval, Action action);
  /// Calls `action` whenever `fd` is readable, has hung up or has an error. The caller keeps ownership of
  /// `fd`.
  [[nodiscard]] std::unique_ptr<Source> watchReadable(int fd, Action action);

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace lmx

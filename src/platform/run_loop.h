// A run loop: timers, descriptors and posted actions, all run by the one thread that calls run().
#pragma once
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>

namespace lmx {

enum class Wait { no, untilDone };

/// Built on our own queue, eventfd and poll rather than on GLib's main context: the thread sanitizer can
/// follow these, and one source a turn is exactly what the main loop wants.
class RunLoop {
 public:
  using Action = std::function<void()>;
  enum class Turn { handledSource, timedOut, stopped };

  RunLoop();
  ~RunLoop();
  RunLoop(const RunLoop&) = delete;
  RunLoop& operator=(const RunLoop&) = delete;

  /// Makes the calling thread the loop's owner. run() does so too; call it earlier when posts come before the
  /// first turn.
  void adoptThread();

  /// Runs at most `limit`, returns after the first source handled (a posted action, a due timer or a ready
  /// descriptor; posted actions first, in the order of posting). Owner thread only. May be nested in an
  /// action.
  Turn run(std::chrono::milliseconds limit);

  /// Runs `action` on the owner thread. Thread-safe. `untilDone` blocks the caller until it has run; on the
  /// owner thread itself it runs at once. Hold no lock that `action` may take.
  /// @return false when the loop has stopped and the action will not run.
  bool post(Action action, Wait wait);

  /// Ends the loop: run() returns `stopped`, waiting posters wake with false, later posts are refused.
  /// Thread-safe.
  void stop();
  [[nodiscard]] bool isOwnerThread() const;

  /// Keeps a timer or a descriptor watch alive; its destruction (owner thread) removes it. It must not
  /// outlive the loop.
  class Source {
   public:
    virtual ~Source() = default;
  };
  /// Calls `action` every `interval` on the owner thread, first after one interval. Missed beats are not made
  /// up.
  [[nodiscard]] std::unique_ptr<Source> addRepeatingTimer(std::chrono::milliseconds interval, Action action);
  /// Calls `action` whenever `fd` is readable, has hung up or has an error. The descriptor stays the
  /// caller's.
  [[nodiscard]] std::unique_ptr<Source> watchReadable(int fd, Action action);

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace lmx

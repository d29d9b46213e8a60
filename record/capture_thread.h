// The thread that runs while a recording is active: starts the capture and checks the stop times.
#pragma once
#include <memory>

namespace lmx {

class AgentRecord;

/// Owns no thread handle: the thread keeps the session alive itself, ends with the capture, and is never
/// joined (a stop may be waiting on it from the main thread). cancel() asks it to end at its next turn, at
/// most 0.25 s later.
class CaptureThread {
 public:
  /// Starts a thread that runs videoRunLoop on `session`. @return null when no thread could be made.
  static std::shared_ptr<CaptureThread> start(std::shared_ptr<AgentRecord> session);
  void cancel();

 private:
  struct State;
  explicit CaptureThread(std::shared_ptr<State> state);
  std::shared_ptr<State> state_;
};

}  // namespace lmx

// The thread that runs while a recording is active: starts the capture and checks the stop times.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"

namespace lmx {

class AgentRecord;
class LMRCaptureController;

/// Owns no thread handle: the thread keeps the session alive itself, ends with the capture, and is never
/// joined (a stop may be waiting on it from the main thread). cancel() asks it to end at its next turn, at
/// most 0.25 s later.
class CaptureThread {
 public:
  /// Starts a thread that runs videoRunLoop on `session`.
  /// @param controller  its capture; null for a recording of a file
  /// @return null when no thread could be made (logged).
  static std::shared_ptr<CaptureThread> start(std::shared_ptr<AgentRecord> session,
                                              std::shared_ptr<LMRCaptureController> controller);
  void cancel();

 private:
  struct State;
  explicit CaptureThread(std::shared_ptr<State> state);
  std::shared_ptr<State> state_;
};

}  // namespace lmx

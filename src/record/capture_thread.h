// The thread that runs while a recording is active. It starts the capture and checks the stop times.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"

namespace lmx {

class AgentRecord;
class LMRCaptureController;

/// Owns no thread handle. The thread keeps the session alive, ends with the capture and is never joined,
/// because a stop may be waiting for the main thread on it. cancel() makes it end at its next turn, within
/// 0.25 s.
class CaptureThread {
 public:
  /// Starts a thread that runs videoRunLoop on `session`.
  /// @param controller  the session's capture; null for a recording of a file
  /// @return null when no thread could be created (logged)
  static std::shared_ptr<CaptureThread> start(std::shared_ptr<AgentRecord> session,
                                              std::shared_ptr<LMRCaptureController> controller);
  void cancel();

 private:
  struct State;
  explicit CaptureThread(std::shared_ptr<State> state);
  std::shared_ptr<State> state_;
};

}  // namespace lmx

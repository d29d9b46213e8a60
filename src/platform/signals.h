// Delivers signals as run-loop work.
#pragma once
#include <functional>
#include <memory>
#include <vector>

#include "platform/run_loop.h"

namespace lmx {

/// Installs one handler for `signals` (SA_RESTART, every signal blocked while it runs) that writes the signal
/// number to a pipe. `action` then receives it on the loop's owner thread. One instance at a time;
/// destruction restores the old handlers.
class SignalSource {
 public:
  SignalSource(RunLoop& loop, const std::vector<int>& signals, std::function<void(int)> action);
  ~SignalSource();
  SignalSource(const SignalSource&) = delete;
  SignalSource& operator=(const SignalSource&) = delete;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace lmx

// The daemon's main loop, which runs periodic checks between turns of the run loop.
#pragma once
#include <cstdint>
#include <memory>

#include "agent/capture_actions.h"
#include "agent/device_watch.h"
#include "agent/submission.h"
#include "agent/timed_command_runner.h"
#include "model/agent_context.h"
#include "platform/run_loop.h"
#include "platform/service_manager.h"
#include "prefs/agent_preferences.h"

namespace lmx {

/// Main thread only.
class MainLoop {
 public:
  /// The parts that the loop drives. All of them outlive it.
  struct Parts {
    AgentContext& context;
    RunLoop& loop;
    CaptureActions& capture;
    DeviceWatch& devices;
    TimedCommandRunner& timed_commands;
    const Submission& submission;
    ServiceManager* service_manager;  ///< null only in tests that don't change preferences
  };
  explicit MainLoop(const Parts& parts) : parts_(parts) {}

  /// Watches the preferences file for changes from now on. @param preferences  outlives the loop
  void watchPreferences(AgentPreferences& preferences) { preferences_ = &preferences; }
  /// Runs until the agent is asked to end. @return 0 for an orderly end, 1 when the capture device was lost
  int appLoop();

 private:
  void stopForgottenPreview(std::int64_t now);
  void reloadChangedPreferences();
  /// Ends the process a minute after the server has refused the agent, but never during a recording: the
  /// refusal is a line that anybody on the way can write.
  void checkServerRefusal(std::int64_t now);

  const Parts parts_;
  AgentPreferences* preferences_ = nullptr;
  bool refusal_waits_ = false;  ///< the notice about the wait for a recording has been written
};

}  // namespace lmx

// Scripted agent actions that record what was performed, in which order and with which wait.
#pragma once
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "model/agent_actions.h"
#include "model/codes.h"
#include "tests/unit/doubles/journal.h"

namespace lmx::testing {

/// Runs every action at once on the caller's thread and records it in the journal, as "prepareCapture,
/// waiting" or "stopRecording". A test scripts an action through its hook.
class ScriptedActions : public AgentActions {
 public:
  explicit ScriptedActions(Journal& journal) : journal_(journal) {}

  bool loop_runs = true;  ///< false: the main loop has ended and nothing is performed
  std::function<void()> on_prepare_capture;
  std::function<void()> on_stop_recording;
  std::function<void()> on_resume_capture;
  std::function<void()> on_stop_capture;

  bool perform(Action action, Wait wait) override {
    if (!loop_runs) return false;
    waiting_ = wait == Wait::untilDone;
    (this->*action)();
    waiting_ = false;
    return true;
  }

  bool performFor(const std::string& request, Action action, Wait wait) override {
    addressed.push_back(request);
    return perform(action, wait);
  }
  std::vector<std::string> addressed;  ///< the request of each performFor

  int performStart(const SharedDictionary& properties) override {
    if (!loop_runs) return kRecordInvalidType;
    started.push_back(properties);
    note("performStart");
    return start_result;
  }
  [[nodiscard]] bool isMainThread() const override { return is_main_thread; }
  std::vector<SharedDictionary> started;  ///< the parameters of each START
  int start_result = kRecordSuccess;
  bool is_main_thread = false;

  void prepareCapture() override { note("prepareCapture", on_prepare_capture); }
  void startPreview() override { note("startPreview"); }
  void stopPreview() override { note("stopPreview"); }
  void pauseCapture() override { note("pauseCapture"); }
  void resumeCapture() override { note("resumeCapture", on_resume_capture); }
  void stopCapture() override { note("stopCapture", on_stop_capture); }
  void cancelCapture() override { note("cancelCapture"); }
  void cancelRecording() override { note("cancelRecording"); }
  void stopRecording() override { note("stopRecording", on_stop_recording); }
  void setRecorderStatusToIdle() override { note("setRecorderStatusToIdle"); }
  void submitStoppedRecording() override { note("submitStoppedRecording"); }
  void shutDownControl() override { note("shutDownControl"); }
  void shutDownControlBecauseDeviceFailed() override { note("shutDownControlBecauseDeviceFailed"); }
  void captureDidComplete(const void*) override { note("captureDidComplete"); }
  void captureDidCancel(const void*) override { note("captureDidCancel"); }

  void scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) override {
    note("scheduleTimedCommand " + lookUp(entry, "command").value_or("(none)"));
    scheduled.push_back({std::move(entry), date, channel});
  }
  [[nodiscard]] std::unique_ptr<RunLoop::Source> watchNetwork(std::function<void()> changed) override {
    if (!network_can_be_watched) return nullptr;
    network_changed = std::move(changed);
    return std::make_unique<RunLoop::Source>();
  }
  bool network_can_be_watched = true;
  std::function<void()> network_changed;  ///< callback of the last watch
  struct Scheduled {
    SharedDictionary entry;
    std::time_t date;
    ChannelKind channel;
  };
  std::vector<Scheduled> scheduled;

  void recordDidStartWithFile(const std::string& file, const SharedDictionary&,
                              std::optional<TimeValue>) override {
    note("recordDidStart " + file);
  }
  void recordDidPauseWithFile(const std::string& file, const SharedDictionary&, std::int64_t) override {
    note("recordDidPause " + file);
  }
  void recordDidResumeWithFile(const std::string& file, const SharedDictionary&) override {
    note("recordDidResume " + file);
  }
  void recordRuntimeErrorCallback(int code) override { note("recordRuntimeError " + std::to_string(code)); }
  void recordDidStopWithFile(const std::shared_ptr<AgentRecord>&, const std::string& file,
                             const SharedDictionary&, std::optional<TimeValue>, std::int64_t elapsedSeconds,
                             std::optional<TimeValue>, bool canceled) override {
    note("recordDidStop " + file + " " + std::to_string(elapsedSeconds) + (canceled ? " canceled" : ""));
  }

 private:
  void note(const std::string& what, const std::function<void()>& script = {}) {
    journal_.add(waiting_ ? what + ", waiting" : what);
    if (script) script();
  }

  Journal& journal_;
  static inline thread_local bool waiting_ = false;
};

}  // namespace lmx::testing

// Processes a stopped recording: movie, properties document, job.
#pragma once
#include <atomic>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "model/agent_context.h"
#include "platform/run_loop.h"
#include "postprocess/scheduler.h"
#include "record/agent_record.h"

namespace lmx {

class AgentActions;

/// "Main thread" is the thread that runs the loop.
class Submission {
 public:
  using Time = std::optional<TimeValue>;

  /// The object outlives its work items.
  /// @param actions, loop, scheduler  outlive the object and the work items it has started
  Submission(std::shared_ptr<AgentContext> context, AgentActions& actions, RunLoop& loop,
             const PostProcessScheduler& scheduler)
      : context_(std::move(context)), actions_(actions), loop_(loop), scheduler_(scheduler) {}

  /// Keeps a copy of the session until the capture of `controller` reports, since the session may move on to
  /// the next recording before that. Main thread.
  void rememberStopped(const std::shared_ptr<LMRCaptureController>& controller);
  /// A capture has ended. Submits its recording. Any thread.
  void captureDidComplete(const void* controller);
  /// A capture was cancelled. The session becomes idle unless it has moved on, and requests that were not
  /// cancelled are recovered. Any thread.
  void captureDidCancel(const void* controller);
  /// Submits the session's recording while its capture continues. Main thread.
  void submitStoppedRecording();

  /// Logs the stop, writes the properties document and queues the job. Any thread.
  /// @return false when the recording should have a document but has none; true also when the agent is ending
  bool announceStop(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                    const SharedDictionary& metadata, Time atTime, std::int64_t elapsedSeconds,
                    Time stoppedTime, bool canceled);

  /// Makes movies from recordings that an earlier process left unfinished in the repository. Runs in the
  /// background.
  void recoverUnfinishedRecordings(std::shared_ptr<CaptureFramework> framework);
  /// Writes documents beside recovered movies and logs one line for each. Submits nothing. Any thread.
  void keepRecovered(const std::vector<RecoveredRecording>& recordings);

  /// Whether no recording is being handed over, queued or submitted.
  [[nodiscard]] bool isIdle() const;

 private:
  std::shared_ptr<AgentRecord> takeStopped(const void* controller);
  class HandOff;
  void submit(const std::shared_ptr<AgentRecord>& stopped, const std::shared_ptr<HandOff>& hand_off);
  void handOff(const std::shared_ptr<AgentRecord>& stopped, const std::string& path, double elapsed);
  /// @return whether the recording is settled: movie and document exist, or there was nothing to write
  bool finishMovie(const std::shared_ptr<AgentRecord>& stopped, LMRCaptureController& controller,
                   const std::string& path, double elapsed);
  void leaveError(const LMRCaptureController* controller);
  [[nodiscard]] std::shared_ptr<AgentRecord> sessionOf(const LMRCaptureController* controller) const;
  [[nodiscard]] bool wantsSubmission(const SharedDictionary& properties) const;

  const std::shared_ptr<AgentContext> context_;
  AgentActions& actions_;
  RunLoop& loop_;
  const PostProcessScheduler& scheduler_;
  std::map<const void*, std::shared_ptr<AgentRecord>> stopped_;  ///< by controller; main thread
  /// The last capture whose report has been handled, so that no further report is expected. Main thread.
  std::weak_ptr<LMRCaptureController> reported_;
  std::atomic<int> hand_offs_{0};  ///< captures that have ended but whose job is not in the list yet
};

}  // namespace lmx

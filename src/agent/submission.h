// The way of a stopped recording: movie, properties document, job.
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

/// "Main thread" is the one that turns the loop.
class Submission {
 public:
  using Time = std::optional<TimeValue>;

  /// @param actions, loop, scheduler  outlive the object and the work items it has started
  Submission(std::shared_ptr<AgentContext> context, AgentActions& actions, RunLoop& loop,
             const PostProcessScheduler& scheduler)
      : context_(std::move(context)), actions_(actions), loop_(loop), scheduler_(scheduler) {}

  /// Keeps the session as it is now, until the capture of `controller` reports: by then the session may have
  /// gone on to the next recording. Main thread.
  void rememberStopped(const std::shared_ptr<LMRCaptureController>& controller);
  /// A capture came to its end: what it recorded is submitted. Any thread.
  void captureDidComplete(const void* controller);
  /// A capture was cancelled: the session becomes idle unless it has gone on; what nobody cancelled is kept.
  /// Any thread.
  void captureDidCancel(const void* controller);
  /// Submits what the session records, while its capture goes on. Main thread.
  void submitStoppedRecording();

  /// Logs the stop, writes the properties document and queues the job. Any thread.
  /// @return false when the recording should have a document and has none
  bool announceStop(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                    const SharedDictionary& metadata, Time atTime, std::int64_t elapsedSeconds,
                    Time stoppedTime, bool canceled);

  /// Makes movies of what an earlier process left unfinished in the repository, in the background.
  void recoverUnfinishedRecordings(std::shared_ptr<CaptureFramework> framework);
  /// Puts recovered movies' documents beside them and logs one line each; nothing is submitted. Any thread.
  void keepRecovered(const std::vector<RecoveredRecording>& recordings);

  /// Whether no recording is on its way to the queue, in it, or in hand.
  [[nodiscard]] bool isIdle() const;

 private:
  std::shared_ptr<AgentRecord> takeStopped(const void* controller);
  void submit(const std::shared_ptr<AgentRecord>& stopped);
  void handOff(const std::shared_ptr<AgentRecord>& stopped, const std::string& path, double elapsed);
  /// @return whether nothing is left to do for the recording: movie and document are there, or there was
  /// nothing
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
  /// The last capture whose report has been dealt with: nothing more is to be expected of it. Main thread.
  std::weak_ptr<LMRCaptureController> reported_;
  std::atomic<int> hand_offs_{0};  ///< captures that have ended and whose job is not in the list yet
};

}  // namespace lmx

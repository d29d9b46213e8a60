// Processes a stopped recording: movie, properties document, job.
#pragma once
#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "agent/hand_off_order.h"
#include "agent/job_maker.h"
#include "agent/recovered_recordings.h"
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
             const PostProcessScheduler& scheduler);

  /// Keeps a copy of the session until the capture of `controller` reports, since the session may move on to
  /// the next recording before that. Its recording has its place in the queue from now on. Main thread.
  void rememberStopped(const std::shared_ptr<LMRCaptureController>& controller);
  /// A capture has ended. Submits its recording. Any thread.
  void captureDidComplete(const void* controller);
  /// A capture was cancelled. The session becomes idle unless it has moved on, and requests that were not
  /// cancelled are recovered. Any thread.
  void captureDidCancel(const void* controller);
  /// Submits the session's recording while its capture continues. Main thread.
  void submitStoppedRecording();

  /// Logs the stop, writes the properties document and queues the job of a recording without a capture. Any
  /// thread.
  void announceStop(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                    const SharedDictionary& metadata, Time atTime, std::int64_t elapsedSeconds,
                    Time stoppedTime, bool canceled);

  /// Takes up what an earlier process has left in the repository. Runs in the background. Main thread.
  void takeUpUnfinished(std::shared_ptr<CaptureFramework> framework) {
    recovered_.takeUp(std::move(framework));
  }
  /// Jobs that have waited too long for an older recording go ahead. To be called now and then.
  void letOverduePass() { order_.letOverduePass(HandOffOrder::Clock::now()); }

  /// Whether no recording is being handed over, queued or submitted.
  [[nodiscard]] bool isIdle() const;

 private:
  using Ticket = std::shared_ptr<HandOffOrder::Ticket>;
  struct Stopped {
    std::shared_ptr<AgentRecord> record;
    Ticket ticket;
  };
  Stopped takeStopped(const void* controller, Ticket reported);
  void submit(Stopped stopped);
  void handOff(const Stopped& stopped, double elapsed);
  /// @return where the movie is; nothing when it could not be made (logged)
  Result<std::string, CaptureError> makeMovie(const AgentRecord& stopped, LMRCaptureController& controller);
  /// @return the job; null: none
  std::shared_ptr<AgentSubmit> announce(const JobMaker::Finished& finished,
                                        const HandOffOrder::Ticket& ticket);
  void logEarlyEnd(LMRCaptureController& controller, const std::string& path);
  void settle(const Stopped& stopped, LMRCaptureController& controller, std::shared_ptr<AgentSubmit> job);
  void leaveToTheNextStart(const AgentSubmit& job) const;
  void leaveError(const LMRCaptureController* controller);
  [[nodiscard]] std::shared_ptr<AgentRecord> sessionOf(const LMRCaptureController* controller) const;

  const std::shared_ptr<AgentContext> context_;
  AgentActions& actions_;
  RunLoop& loop_;
  const PostProcessScheduler& scheduler_;
  HandOffOrder order_;
  JobMaker jobs_;
  RecoveredRecordings recovered_;
  std::map<const void*, Stopped> stopped_;  ///< by controller; main thread
  /// The last capture whose report has been handled, so that no further report is expected. Main thread.
  std::weak_ptr<LMRCaptureController> reported_;
};

}  // namespace lmx

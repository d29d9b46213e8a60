// Takes care of recordings and jobs that an earlier process, or an ended capture, has left.
#pragma once
#include <memory>
#include <vector>

#include "agent/hand_off_order.h"
#include "agent/job_maker.h"
#include "capture/api/capture_framework.h"
#include "model/agent_context.h"

namespace lmx {

class RecoveredRecordings {
 public:
  /// @param jobs, order  outlive the object and the work item it starts
  RecoveredRecordings(std::shared_ptr<AgentContext> context, JobMaker& jobs, HandOffOrder& order)
      : context_(std::move(context)), jobs_(jobs), order_(order) {}

  /// Takes up the jobs that wait, and makes movies of the recordings that were left unfinished in the
  /// repository, in the background. A recording that had been stopped is submitted, any other is not.
  /// Main thread, once, at the start.
  void takeUp(std::shared_ptr<CaptureFramework> framework);
  /// Writes documents beside recovered movies and logs one line for each. Any thread.
  /// @return the jobs of those that are to be submitted; deliver them with `ticket`
  [[nodiscard]] HandOffOrder::Jobs keep(const std::vector<RecoveredRecording>& recordings,
                                        const HandOffOrder::Ticket& ticket);

 private:
  void takeUpJobs();
  [[nodiscard]] bool writeDocument(const JobMaker::Finished& finished) const;
  [[nodiscard]] std::shared_ptr<AgentSubmit> makeJob(const RecoveredRecording& recording,
                                                     const HandOffOrder::Ticket& ticket);

  const std::shared_ptr<AgentContext> context_;
  JobMaker& jobs_;
  HandOffOrder& order_;
};

}  // namespace lmx

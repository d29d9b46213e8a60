// The recording engine's entry points: prepare, stop and report on the agent's one recording.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "capture/api/capture_framework.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "record/agent_record.h"

namespace lmx {

class MyLMRPreviewController;

/// What the engine works with, set once at start-up before any thread starts and reached by the plain
/// functions below: the agent's context, its actions and the capture framework. Any of them may be absent in
/// tests.
struct EngineEnvironment {
  std::shared_ptr<AgentContext> context;
  AgentActions* actions = nullptr;  ///< lives until the process ends
  std::shared_ptr<CaptureFramework> framework;
};
void setEngineEnvironment(EngineEnvironment environment);
EngineEnvironment engineEnvironment();

/// Prepares and starts a recording with `metadata`. Main thread. @return a RecordError.
int LXAgentRecordPrepareCapture(AgentContext& context, SharedDictionary metadata);
int LXAgentRecordPrepareCaptureSync(AgentContext& context, const std::optional<std::string>& path,
                                    SharedDictionary metadata);
/// Stops the session's recording; see the capture thread and AgentRecord::cleanup. @return a RecordError.
int LXAgentRecordStopCapture(const std::shared_ptr<AgentRecord>& session);
/// @return 0, or 3 when the capture framework refuses.
int LXAgentRecordPrepareCaptureController(AgentContext& context);

/// Outputs of LXAgentRecordGetStatus. Times that are not set are left as they were.
struct RecordStatus {
  std::int32_t recordStatus = 0;
  std::int32_t start = 0;  ///< seconds since 1970, as the following two
  std::int64_t elapsedSeconds = 0;
  std::int32_t stop = 0;
  std::int32_t hardStop = 0;
  double availableDiskMB = 0;
  double totalDiskMB = 0;
  std::int32_t lastError = 0;
};
/// @param status  may be null. @return 0, 2 without a session, 6 when the lock can't be had.
int LXAgentRecordGetStatus(const std::shared_ptr<AgentRecord>& session, RecordStatus* status);

/// A controller that has the camera open, or null (logged).
std::shared_ptr<MyLMRPreviewController> LXAgentRecordCreatePreviewController(
    const std::optional<std::string>& videoDevice, const std::optional<std::string>& audioDevice,
    bool addAudio, std::int64_t intervalMilliseconds, std::shared_ptr<CaptureSession> session);

/// Free kilobytes (2^10 bytes) of the volume of `path`; all ones when it can't be measured, with the reason
/// in `*errorOut`.
std::uint64_t LXAgentFreeKilobytesAtPath(const std::string& path, int* errorOut);
/// @return 1 when the volume of the movie has `thresholdMB` or more, else 0 (logged).
int LXAgentRecordHasDiskSpace(std::uint32_t thresholdMB, const std::string& moviePath);
std::uint64_t LXAgentRecordAvailableDiskKilobytes(const std::shared_ptr<AgentRecord>& session);
std::uint64_t LXAgentRecordAvailableDiskMegabytes(const std::shared_ptr<AgentRecord>& session);
double LXAgentRecordTotalDiskMegabytes(const std::shared_ptr<AgentRecord>& session);

/// The stop time of a finished recording: now less the time shift.
std::optional<TimeValue> shiftedNow(const AgentContext& context);

}  // namespace lmx

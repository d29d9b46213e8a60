// The recorder's state for STATUS.
#pragma once
#include <cstdint>
#include <memory>

#include "model/codes.h"
#include "record/agent_record.h"

namespace lmx {

/// Output of LXAgentRecordGetStatus. A time that is not set leaves its field unchanged.
struct RecordStatus {
  std::int32_t recordStatus = kRecorderIdle;
  std::int32_t start = 0;  ///< seconds since 1970, as are the next two
  std::int64_t elapsedSeconds = 0;
  std::int32_t stop = 0;
  std::int32_t hardStop = 0;
  double availableDiskMB = 0;
  double totalDiskMB = 0;
  std::int32_t lastError = kRecordSuccess;
};

/// @param status  may be null
/// @return 0; 2 without a session; 6 when the lock fails
int LXAgentRecordGetStatus(const std::shared_ptr<AgentRecord>& session, RecordStatus* status);

}  // namespace lmx

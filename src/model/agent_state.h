// The agent's current state, shared by its threads.
#pragma once
#include <cstdint>
#include <optional>

#include "support/dictionary.h"
#include "support/shared_value.h"
#include "support/time_value.h"

namespace lmx {

/// Fields are thread-safe. Times in seconds count from 1970.
struct AgentState {
  SharedValue<bool> running;
  SharedValue<std::optional<TimeValue>> launch_time;
  SharedValue<std::int64_t> last_device_check;  ///< seconds; below 1: not waiting for a camera
  SharedValue<bool> agent_sent_or_fail;         ///< whether the tunnel's hello has been sent or has failed
  SharedValue<std::int32_t> timeshift_seconds;
  SharedValue<std::int32_t> status;            ///< result of the last capture action, a RecordError
  SharedValue<std::int64_t> serverRejectTime;  ///< seconds; time of the server's last refusal, 0: never
  SharedValue<SharedDictionary> properties;    ///< the parameters of the last START
};

}  // namespace lmx

// Asks the session and its capture.
#include "agent/recording_in_hand.h"

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "record/agent_record.h"

namespace lmx {

bool recordingInHand(const AgentContext& context) {
  const auto record = context.record_context();
  if (!record) return false;
  if (record->status.get() != kRecorderIdle) return true;
  // A STOP makes the session idle at once; the capture reports its end later.
  const auto controller = record->captureController.get();
  return controller && !controller->hasShutDown();
}

}  // namespace lmx

// The body of the capture thread.
#include "record/capture_thread.h"

#include <atomic>
#include <chrono>
#include <system_error>
#include <thread>

#include "capture/api/capture_framework.h"
#include "platform/log.h"
#include "platform/run_loop.h"
#include "record/agent_record.h"
#include "record/auto_shutoff.h"
#include "record/stop_capture.h"

namespace lmx {

using namespace std::chrono_literals;

struct CaptureThread::State {
  std::atomic<bool> cancelled{false};
};

namespace {

/// Starts the capture, then checks the stop times every 15 seconds until the controller has shut down or
/// `cancelled` ends it.
void videoRunLoop(const std::shared_ptr<AgentRecord>& session,
                  const std::shared_ptr<LMRCaptureController>& controller,
                  const std::atomic<bool>& cancelled) {
  if (controller && !controller->startRecording()) {
    LMPLogMessage(nullptr, kLogCritical, "The recording failed to start");
    LXAgentRecordStopCapture(session);
    return;
  }
  session->startTime.set(lmp_gettimeofday());

  RunLoop loop;
  loop.adoptThread();
  const auto check = [&] { checkForAutoShutoffConditions(*session); };
  const auto timer = loop.addRepeatingTimer(15s, check);
  session->autoShutoffCheckTimer.set(true);
  check();
  while (!cancelled && controller && session->captureController.get() == controller &&
         !controller->hasShutDown()) {
    loop.run(250ms);
  }
  session->autoShutoffCheckTimer.set(false);
}

}  // namespace

CaptureThread::CaptureThread(std::shared_ptr<State> state) : state_(std::move(state)) {}

std::shared_ptr<CaptureThread> CaptureThread::start(std::shared_ptr<AgentRecord> session,
                                                    std::shared_ptr<LMRCaptureController> controller) {
  auto state = std::make_shared<State>();
  try {
    std::thread([session = std::move(session), controller = std::move(controller), state] {
      videoRunLoop(session, controller, state->cancelled);
    }).detach();
  } catch (const std::system_error& error) {
    LMPLogMessage(nullptr, kLogCritical, "The capture thread could not be started: %s", error.what());
    return nullptr;
  }
  return std::shared_ptr<CaptureThread>(new CaptureThread(std::move(state)));
}

void CaptureThread::cancel() { state_->cancelled = true; }

}  // namespace lmx

// The agent with a scripted framework, child runner and service manager. The test drives its main loop.
#pragma once
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>

#include "agent/agent_main.h"
#include "capture/api/capture_framework.h"
#include "postprocess/agent_submit.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_framework.h"
#include "tests/unit/doubles/scripted_services.h"
#include "tests/unit/doubles/test_root.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {

/// An agent marked as running, with an idle "Audio+Video" session. The daemon is not started and its loop
/// does not run.
class AgentTest : public ::testing::Test {
 protected:
  using Entries = std::vector<std::string>;
  using Controller = std::shared_ptr<testing::ScriptedCaptureController>;

  AgentTest() {
    std::filesystem::remove_all(systemPath(kJobsDirectory));  // those of the test before
    testing::writePreferences(testing::capturePreferences(repository_.path()));
    framework_->on_new_controller = [](auto& controller) {
      controller.on_process_request = [](const std::string& path) {
        testing::writeFile(path, "movie");
        return std::optional<CaptureError>();
      };
    };
    context_->state.running.set(true);
    context_->recording.recording_type.set("Audio+Video");
    context_->recording.recording_repository_path.set(repository_.path());
    session_->recordingType.set(kRecordingTypeAudioVideo);
  }
  /// Ends the captures and waits until no thread or work item can reach the agent any more.
  ~AgentTest() override {
    session_->status.set(kRecorderIdle);
    session_ = nullptr;
    context_->cleanup();
    for (std::size_t i = 0; i < framework_->controllersMade(); ++i) {
      const auto made = framework_->controller(i);
      if (!made) continue;
      made->shut_down = true;
      agent_.captureDidCancel(made.get());  // drops the session kept for a capture that has not reported
    }
    // Work items may still post actions that hold a capture.
    EXPECT_TRUE(testing::waitUntil([&] {
      turnTheLoop();
      return framework_->allReleased();
    }));
  }

  void turnTheLoop() {
    while (agent_.mainRunLoop().run(std::chrono::milliseconds(0)) == RunLoop::Turn::handledSource) {
    }
  }
  void setParameters(Dictionary values) {
    context_->state.properties.set(std::make_shared<const Dictionary>(std::move(values)));
  }
  /// Does what a START does: parameters, prepare, mark. @return the capture's controller
  Controller start(const std::string& uuid, Dictionary more = {}) {
    more["RecordingMetadata_RECORDING_UUID"] = uuid;
    setParameters(std::move(more));
    agent_.prepareCapture();
    EXPECT_EQ(context_->state.status.get(), 0);
    session_->request.set({.uuid = "request of " + uuid, .properties = context_->state.properties.get()});
    Controller made = framework_->controller(framework_->controllersMade() - 1);
    made->state = 3;
    return made;
  }
  /// Reports the end of the capture as the framework does, from a thread of its own.
  static void reportEnd(const Controller& controller, const std::optional<CaptureError>& error = {}) {
    controller->shut_down = true;
    std::thread([&] {
      if (const auto delegate = controller->delegate()) delegate->lmrCaptureDidComplete(error);
    }).join();
  }
  /// Waits for the next job in the list.
  std::shared_ptr<AgentSubmit> nextJob() {
    std::shared_ptr<AgentSubmit> job;
    testing::waitUntil([&] { return (job = context_->post_process_list.postProcessListNext()) != nullptr; });
    return job;
  }
  [[nodiscard]] std::string movie(const std::string& name) const { return repository_.file(name); }
  [[nodiscard]] std::ptrdiff_t journalCount(const std::string& entry) const {
    const Entries entries = journal_.entries();
    return std::count(entries.begin(), entries.end(), entry);
  }

  testing::LogCapture log_;
  testing::TemporaryDirectory repository_;
  testing::Journal journal_;
  std::shared_ptr<testing::ScriptedFramework> framework_ =
      std::make_shared<testing::ScriptedFramework>(journal_);
  testing::ScriptedChildRunner children_;
  std::shared_ptr<testing::ScriptedServiceManager> services_ =
      std::make_shared<testing::ScriptedServiceManager>();
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::shared_ptr<AgentRecord> session_ = context_->record_context();
  AgentMain agent_{context_, {framework_, services_, &children_}};
};

}  // namespace lmx

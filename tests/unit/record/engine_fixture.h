// The recording engine with a scripted framework and scripted actions.
#pragma once
#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "record/agent_record.h"
#include "record/engine_environment.h"
#include "record/prepare_capture.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/scripted_framework.h"
#include "tests/unit/doubles/test_root.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {

/// A running agent's context with an idle "Audio+Video" session.
class EngineTest : public ::testing::Test {
 protected:
  using Entries = std::vector<std::string>;

  EngineTest() {
    testing::writePreferences(testing::capturePreferences(repository_.path()));
    context_->state.running.set(true);
    context_->recording.recording_repository_path.set(repository_.path());
    session_->recordingType.set(kRecordingTypeAudioVideo);
    setEngineEnvironment({context_, &actions_, framework_});
  }
  /// Ends the capture threads by shutting their controllers down; none may outlive the test.
  ~EngineTest() override {
    session_->status.set(kRecorderIdle);
    endCaptures();
    session_ = nullptr;
    context_ = nullptr;
    setEngineEnvironment({});
    EXPECT_TRUE(testing::waitUntil([&] { return framework_->allReleased(); }));
  }
  void endCaptures() {
    for (std::size_t i = 0; i < framework_->controllersMade(); ++i) {
      if (const auto made = framework_->controller(i)) made->shut_down = true;
    }
  }

  static SharedDictionary parameters(Dictionary values) {
    return std::make_shared<const Dictionary>(std::move(values));
  }
  int prepare(Dictionary values = {{"RecordingMetadata_RECORDING_UUID", "R1"}}) {
    return LXAgentRecordPrepareCapture(*context_, parameters(std::move(values)));
  }
  [[nodiscard]] std::string movie(const std::string& name) const { return repository_.file(name); }
  [[nodiscard]] std::ptrdiff_t journalCount(const std::string& entry) const {
    const Entries entries = journal_.entries();
    return std::count(entries.begin(), entries.end(), entry);
  }

  testing::LogCapture log_;
  testing::TemporaryDirectory repository_;
  testing::Journal journal_;
  testing::ScriptedActions actions_{journal_};
  std::shared_ptr<testing::ScriptedFramework> framework_ =
      std::make_shared<testing::ScriptedFramework>(journal_);
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::shared_ptr<AgentRecord> session_ = context_->record_context();
};

}  // namespace lmx

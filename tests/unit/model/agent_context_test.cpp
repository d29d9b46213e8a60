// The shared record: its defaults, the queue, the cluster information, its end.
#include <gtest/gtest.h>

#include <thread>

#include "model/agent_context.h"
#include "postprocess/agent_submit.h"
#include "record/agent_record.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::LogCapture;

class Context : public ::testing::Test {
 protected:
  LogCapture log_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
};

TEST_F(Context, NewOneHasItsDefaults) {
  EXPECT_FALSE(context_->running());
  EXPECT_EQ(context_->duration(), 240);
  EXPECT_EQ(context_->unattended(), 60);
  EXPECT_EQ(context_->status(), 0);
  EXPECT_NE(context_->record_context(), nullptr);
  EXPECT_EQ(context_->continuous(), LMRContinuousRecordingInfo{});
  EXPECT_FALSE(context_->user());
  EXPECT_EQ(context_->postProcessListCount(), 0U);
}

TEST_F(Context, QueueIsFirstInFirstOut) {
  EXPECT_EQ(context_->postProcessListNext(), nullptr);
  EXPECT_EQ(context_->postProcessListCount(), 0U);
  const auto a = std::make_shared<AgentSubmit>();
  const auto b = std::make_shared<AgentSubmit>();
  context_->postProcessListAddJob(a);
  context_->postProcessListAddJob(b);
  EXPECT_EQ(context_->postProcessListCount(), 2U);
  EXPECT_EQ(context_->postProcessListNext(), a);
  EXPECT_EQ(context_->postProcessListNext(), b);
  EXPECT_EQ(context_->postProcessListNext(), nullptr);
}

TEST_F(Context, QueueTakesJobsFromSeveralThreads) {
  constexpr std::size_t kJobs = 200;
  const auto add = [this] {
    for (std::size_t i = 0; i < kJobs; ++i) context_->postProcessListAddJob(std::make_shared<AgentSubmit>());
  };
  std::thread one(add);
  std::thread two(add);
  std::size_t taken = 0;
  while (taken < 2 * kJobs) {
    if (context_->postProcessListNext()) ++taken;
  }
  one.join();
  two.join();
  EXPECT_EQ(context_->postProcessListCount(), 0U);
}

TEST_F(Context, ServerInfoIsNullBeforeItIsSet) { EXPECT_EQ(context_->server_info_retain(), nullptr); }

TEST_F(Context, ServerInfoThatIsStoredAlreadySurvivesItsStoring) {
  context_->setServer_info(std::make_shared<const PlistDictionary>(PlistDictionary{{"a", "b"}}));
  context_->setServer_info(context_->server_info_retain());
  ASSERT_NE(context_->server_info_retain(), nullptr);
  EXPECT_EQ(*context_->server_info_retain()->at("a").string(), "b");
}

TEST_F(Context, RetainedServerInfoOutlivesItsReplacement) {
  context_->setServer_info(std::make_shared<const PlistDictionary>(PlistDictionary{{"a", "b"}}));
  const auto held = context_->server_info_retain();
  context_->setServer_info(nullptr);
  EXPECT_EQ(held->size(), 1U);
}

TEST_F(Context, MutexesMayBeLockedTwiceByTheirHolder) {
  EXPECT_EQ(context_->lock_control_action_mutex(), 0);
  EXPECT_EQ(context_->lock_control_action_mutex(), 0);
  EXPECT_EQ(context_->unlock_control_action_mutex(), 0);
  EXPECT_EQ(context_->unlock_control_action_mutex(), 0);
  EXPECT_EQ(context_->lock_post_process_list_mutex(), 0);
  EXPECT_EQ(context_->postProcessListCount(), 0U);
  EXPECT_EQ(context_->unlock_post_process_list_mutex(), 0);
  EXPECT_EQ(context_->lock_server_info_mutex(), 0);
  EXPECT_EQ(context_->server_info_retain(), nullptr);
  EXPECT_EQ(context_->unlock_server_info_mutex(), 0);
}

TEST_F(Context, MessagesAreNoFormats) {
  context_->logDebug("100%s");
  context_->logInfo("50%n");
  context_->logWarn("%d");
  EXPECT_EQ(log_.entries(), (std::vector<LogCapture::Entry>{{7, "100%s"}, {6, "50%n"}, {4, "%d"}}));
}

TEST_F(Context, CleanupTakesItApart) {
  context_->setRunning(true);
  context_->setLaunch_time(TimeValue{1, 2});
  context_->setLog_context(LMPLogCreateContext("test", "com.zandor.lumex"));
  context_->setServer_info(std::make_shared<const PlistDictionary>());
  context_->postProcessListAddJob(std::make_shared<AgentSubmit>());
  context_->cleanup();
  EXPECT_FALSE(context_->running());
  EXPECT_FALSE(context_->launch_time());
  EXPECT_FALSE(context_->continuous());
  EXPECT_EQ(context_->log_context(), nullptr);
  EXPECT_EQ(context_->record_context(), nullptr);
  EXPECT_EQ(context_->server_info_retain(), nullptr);
  EXPECT_EQ(context_->postProcessListCount(), 0U);
}

TEST_F(Context, CleanupReleasesTheTunnelInDaemonModeOnly) {
  for (const bool adhoc : {false, true}) {
    const auto context = newAgentContext();
    int released = 0;
    context->setAdhoc(adhoc);
    context->setCleanupHooks([&] { ++released; }, [] { return false; });
    context->cleanup();
    context->cleanup();
    EXPECT_EQ(released, adhoc ? 0 : 1);
  }
  EXPECT_TRUE(log_.entries().empty());
}

TEST_F(Context, CleanupStopsThePostProcessThread) {
  context_->setCleanupHooks({}, [] { return true; });
  context_->cleanup();
  EXPECT_EQ(log_.entries(), (std::vector<LogCapture::Entry>{{6, "Stopping post-process thread..."}}));
}

}  // namespace
}  // namespace lmx

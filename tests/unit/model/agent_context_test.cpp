// The agent context: its defaults, the queue, the cluster information, its cleanup.
#include "model/agent_context.h"

#include <gtest/gtest.h>

#include <thread>

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

TEST_F(Context, NewContextHasDefaults) {
  EXPECT_FALSE(context_->state.running.get());
  EXPECT_EQ(context_->options.duration.get(), 240);
  EXPECT_EQ(context_->options.unattended.get(), 60);
  EXPECT_EQ(context_->state.status.get(), 0);
  EXPECT_NE(context_->record_context(), nullptr);
  EXPECT_EQ(context_->recording.continuous.get(), LMRContinuousRecordingInfo{});
  EXPECT_FALSE(context_->options.user.get());
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
}

TEST_F(Context, QueueIsFirstInFirstOut) {
  EXPECT_EQ(context_->post_process_list.postProcessListNext(), nullptr);
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
  const auto a = std::make_shared<AgentSubmit>();
  const auto b = std::make_shared<AgentSubmit>();
  context_->post_process_list.postProcessListAddJob(a);
  context_->post_process_list.postProcessListAddJob(b);
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 2U);
  EXPECT_EQ(context_->post_process_list.postProcessListNext(), a);
  EXPECT_EQ(context_->post_process_list.postProcessListNext(), b);
  EXPECT_EQ(context_->post_process_list.postProcessListNext(), nullptr);
}

TEST_F(Context, QueueTakesJobsFromSeveralThreads) {
  constexpr std::size_t kJobs = 200;
  const auto add = [this] {
    for (std::size_t i = 0; i < kJobs; ++i)
      context_->post_process_list.postProcessListAddJob(std::make_shared<AgentSubmit>());
  };
  std::thread one(add);
  std::thread two(add);
  std::size_t taken = 0;
  while (taken < 2 * kJobs) {
    if (context_->post_process_list.postProcessListNext()) ++taken;
  }
  one.join();
  two.join();
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
}

TEST_F(Context, ServerInfoIsNullBeforeItIsSet) { EXPECT_EQ(context_->server_info.get(), nullptr); }

TEST_F(Context, StoringTheSameServerInfoAgainKeepsIt) {
  context_->server_info.set(std::make_shared<const PlistDictionary>(PlistDictionary{{"a", "b"}}));
  context_->server_info.set(context_->server_info.get());
  ASSERT_NE(context_->server_info.get(), nullptr);
  EXPECT_EQ(*context_->server_info.get()->at("a").string(), "b");
}

TEST_F(Context, RetainedServerInfoOutlivesItsReplacement) {
  context_->server_info.set(std::make_shared<const PlistDictionary>(PlistDictionary{{"a", "b"}}));
  const auto held = context_->server_info.get();
  context_->server_info.set(nullptr);
  EXPECT_EQ(held->size(), 1U);
}

TEST_F(Context, MessagesAreNotFormatStrings) {
  context_->logDebug("100%s");
  context_->logInfo("50%n");
  context_->logWarn("%d");
  EXPECT_EQ(log_.entries(),
            (std::vector<LogCapture::Entry>{{kLogDebug, "100%s"}, {kLogInfo, "50%n"}, {kLogWarning, "%d"}}));
}

TEST_F(Context, CleanupTakesItApart) {
  context_->state.running.set(true);
  context_->state.launch_time.set(TimeValue{1, 2});
  context_->open(LMPLogCreateContext("test", "com.zandor.lumex"));
  context_->server_info.set(std::make_shared<const PlistDictionary>());
  context_->post_process_list.postProcessListAddJob(std::make_shared<AgentSubmit>());
  context_->cleanup();
  EXPECT_FALSE(context_->state.running.get());
  EXPECT_FALSE(context_->state.launch_time.get());
  EXPECT_FALSE(context_->recording.continuous.get());
  EXPECT_EQ(context_->log_context(), nullptr);
  EXPECT_EQ(context_->record_context(), nullptr);
  EXPECT_EQ(context_->server_info.get(), nullptr);
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
}

}  // namespace
}  // namespace lmx

// From the text of a command to its handler: the gate, the verbs, the log lines.
#include "control/channel/command_dispatcher.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "record/agent_record.h"
#include "tests/unit/control/handlers/collected_replies.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using Replies = std::vector<std::string>;

class Dispatch : public ::testing::Test {
 protected:
  void execute(const std::string& text) { dispatcher_.execute(text, authenticated_); }
  [[nodiscard]] bool contacted() const { return context_->record_context()->lastContact.get().has_value(); }

  testing::LogCapture log_;
  bool authenticated_ = true;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  ChannelContext held_{context_};
  testing::CollectedReplies replies_;
  CommandHandlers handlers_{held_, nullptr, replies_, ChannelKind::detached};
  CommandDispatcher dispatcher_{held_, handlers_, replies_};
};

TEST_F(Dispatch, StatusAloneIsHandledWithoutParameters) {
  execute("STATUS");
  EXPECT_TRUE(replies_.last().starts_with("cmdStatus=0,recordStatus=0,start=0,")) << replies_.last();
  EXPECT_TRUE(log_.contains(kLogDebug, "Command is [STATUS]"));
}

TEST_F(Dispatch, EveryVerbReachesAHandler) {
  for (const char* verb : {"START", "STOP", "PAUSE", "RESUME", "CANCEL", "SERVER", "STATUS", "TIMEDCMD"}) {
    const std::size_t before = replies_.all().size();
    execute(verb);
    EXPECT_EQ(replies_.all().size(), before + 1) << verb;
  }
  EXPECT_FALSE(log_.mentions("Unknown command"));
}

TEST_F(Dispatch, UnknownVerbIsLoggedAndNotAnswered) {
  execute("foo");
  EXPECT_TRUE(replies_.all().empty());
  EXPECT_TRUE(log_.contains(kLogError, "Unknown command [foo]"));
}

TEST_F(Dispatch, ErrFromTheTunnelIsLoggedWhole) {
  execute("ERR something went wrong");
  EXPECT_TRUE(replies_.all().empty());
  EXPECT_TRUE(log_.contains(kLogError, "Received error from tunnel [ERR something went wrong]"));
}

TEST_F(Dispatch, VerbsThatOnlyLookLikeHandlersAreUnknown) {
  for (const std::string verb : {"status", "XCMD", "handleSTATUS", "STATUS:", "ERROR", ""}) {
    execute(verb);
    EXPECT_TRUE(log_.contains(kLogError, "Unknown command [" + verb + "]")) << verb;
  }
  EXPECT_TRUE(replies_.all().empty());
}

TEST_F(Dispatch, AnyVerbThatBeginsWithXIsTakenSilently) {
  execute("X-FOO a=1");
  EXPECT_TRUE(replies_.all().empty());
  EXPECT_FALSE(log_.mentions("Unknown command"));
}

TEST_F(Dispatch, GateRefusesButCountsAsContact) {
  authenticated_ = false;
  execute("STATUS");
  EXPECT_EQ(replies_.all(), Replies{"cmdStatus=36"});
  EXPECT_TRUE(log_.contains(kLogError, "Command rejected because authentication is required [STATUS]"));
  EXPECT_TRUE(contacted());
}

TEST_F(Dispatch, UserauthPassesTheGate) {
  authenticated_ = false;
  execute("USERAUTH user=bob");
  EXPECT_TRUE(replies_.all().empty());
  EXPECT_FALSE(log_.mentions("Command rejected"));
}

TEST_F(Dispatch, UnknownCommandCountsAsContact) {
  ASSERT_FALSE(contacted());
  execute("foo");
  EXPECT_TRUE(contacted());
}

TEST_F(Dispatch, DurationIsLogged) {
  execute("X-FOO");
  const auto entries = log_.entries();
  const std::string& last = entries.back().text;
  EXPECT_EQ(entries.back().level, 7);
  EXPECT_TRUE(last.starts_with("Command: X-FOO took 0.")) << last;
  EXPECT_TRUE(last.ends_with(" seconds")) << last;
}

TEST_F(Dispatch, PasswordStaysOutOfTheLog) {
  for (const char* verb : {"START", "foo", "ERR"})
    execute(std::string(verb) + " RecordingMetadata_AGENT_PASSWORD=sesame,a=1");
  authenticated_ = false;
  execute("STOP RecordingMetadata_AGENT_PASSWORD=sesame");
  EXPECT_FALSE(log_.mentions("sesame"));
  EXPECT_TRUE(log_.contains(kLogDebug, "Command is [START RecordingMetadata_AGENT_PASSWORD=****,a=1]"));
}

}  // namespace
}  // namespace lmx

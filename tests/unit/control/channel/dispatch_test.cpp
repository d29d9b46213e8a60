// From a received chunk to its handler: the gate, the verbs, the log lines.
#include <gtest/gtest.h>

#include "record/agent_record.h"
#include "tests/unit/control/channel/scripted_channel.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::LogCapture;
using testing::ScriptedChannel;
using Replies = std::vector<std::string>;

class Dispatch : public ::testing::Test {
 protected:
  LogCapture log_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  ScriptedChannel channel_{context_, nullptr};
};

TEST_F(Dispatch, StatusAloneIsHandledWithoutParameters) {
  channel_.receive("STATUS\n");
  ASSERT_EQ(channel_.replies().size(), 1U);
  EXPECT_TRUE(channel_.replies()[0].starts_with("cmdStatus=0,recordStatus=0,start=0,"));
  EXPECT_TRUE(log_.contains(7, "Command is [STATUS]"));
}

TEST_F(Dispatch, OnlyTheFirstLineOfAChunkRunsUntilTheNextChunk) {
  channel_.receive("STOP\nfoo\n");
  EXPECT_EQ(channel_.replies(), Replies{"cmdStatus=0"});
  EXPECT_FALSE(log_.mentions("Unknown command"));
  channel_.receive("bar\n");
  EXPECT_TRUE(log_.contains(3, "Unknown command [foo\\nbar]"));
}

TEST_F(Dispatch, LineOverTwoChunksRunsOnce) {
  channel_.receive("ST");
  EXPECT_TRUE(channel_.replies().empty());
  channel_.receive("OP\n");
  EXPECT_EQ(channel_.replies(), Replies{"cmdStatus=0"});
}

TEST_F(Dispatch, AppendingIsLogged) {
  channel_.receive("ST");
  channel_.receive("OP");
  EXPECT_EQ(log_.count(7, "Appending to existing partial command"), 1);
}

TEST_F(Dispatch, CarriageReturnBeforeTheLineFeedIsTrimmed) {
  channel_.receive("STOP\r\n");
  EXPECT_EQ(channel_.replies(), Replies{"cmdStatus=0"});
}

TEST_F(Dispatch, UnknownVerbIsLoggedAndNotAnswered) {
  channel_.receive("foo\n");
  EXPECT_TRUE(channel_.replies().empty());
  EXPECT_TRUE(log_.contains(3, "Unknown command [foo]"));
}

TEST_F(Dispatch, ErrFromTheTunnelIsLoggedWhole) {
  channel_.receive("ERR something went wrong\n");
  EXPECT_TRUE(channel_.replies().empty());
  EXPECT_TRUE(log_.contains(3, "Received error from tunnel [ERR something went wrong]"));
}

TEST_F(Dispatch, VerbsThatOnlyLookLikeHandlersAreUnknown) {
  for (const std::string verb : {"status", "XCMD", "handleSTATUS", "STATUS:", "ERROR", ""}) {
    channel_.receive(verb + "\n");
    EXPECT_TRUE(log_.contains(3, "Unknown command [" + verb + "]")) << verb;
  }
  EXPECT_TRUE(channel_.replies().empty());
}

TEST_F(Dispatch, AnyVerbThatBeginsWithXIsTakenSilently) {
  channel_.receive("X-FOO a=1\n");
  EXPECT_TRUE(channel_.replies().empty());
  EXPECT_FALSE(log_.mentions("Unknown command"));
}

TEST_F(Dispatch, GateRefusesButCountsAsContact) {
  channel_.requires_authentication = true;
  channel_.receive("STATUS\n");
  EXPECT_EQ(channel_.replies(), Replies{"cmdStatus=36"});
  EXPECT_TRUE(log_.contains(3, "Command rejected because authentication is required [STATUS]"));
  EXPECT_TRUE(context_->record_context()->lastContact.get().has_value());
}

TEST_F(Dispatch, UserauthPassesTheGate) {
  channel_.requires_authentication = true;
  channel_.receive("USERAUTH user=bob\n");
  const Replies replies = channel_.replies();
  EXPECT_EQ(std::count(replies.begin(), replies.end(), "cmdStatus=36"), 0);
  EXPECT_FALSE(log_.mentions("Command rejected"));
}

TEST_F(Dispatch, UnknownCommandCountsAsContact) {
  ASSERT_FALSE(context_->record_context()->lastContact.get().has_value());
  channel_.receive("foo\n");
  EXPECT_TRUE(context_->record_context()->lastContact.get().has_value());
}

TEST_F(Dispatch, LineThatTheTransportRejectsIsIgnored) {
  channel_.readable_lines = false;
  channel_.receive("STATUS\n");
  EXPECT_TRUE(channel_.replies().empty());
  EXPECT_FALSE(context_->record_context()->lastContact.get().has_value());
  EXPECT_FALSE(log_.mentions("Command"));
}

TEST_F(Dispatch, DurationIsLogged) {
  channel_.receive("X-FOO\n");
  const auto entries = log_.entries();
  const std::string& last = entries.back().text;
  EXPECT_EQ(entries.back().level, 7);
  EXPECT_TRUE(last.starts_with("Command: X-FOO took 0.")) << last;
  EXPECT_TRUE(last.ends_with(" seconds")) << last;
}

TEST_F(Dispatch, PasswordStaysOutOfTheLog) {
  for (const char* verb : {"START", "foo", "ERR"}) {
    channel_.receive(std::string(verb) + " RecordingMetadata_AGENT_PASSWORD=sesame,a=1\n");
  }
  channel_.requires_authentication = true;
  channel_.receive("STOP RecordingMetadata_AGENT_PASSWORD=sesame\n");
  EXPECT_FALSE(log_.mentions("sesame"));
  EXPECT_TRUE(log_.contains(7, "Command is [START RecordingMetadata_AGENT_PASSWORD=****,a=1]"));
}

TEST_F(Dispatch, EndlessCommandIsDroppedWithOneErrorLine) {
  const std::string chunk(1024, 'x');
  for (int i = 0; i <= 1024; ++i) channel_.receive(chunk);
  EXPECT_EQ(log_.count(3, "Command of more than 1048576 bytes without an end dropped"), 1);
  channel_.receive("STOP\n");
  EXPECT_EQ(channel_.replies(), Replies{"cmdStatus=0"});
}

TEST_F(Dispatch, EveryHandlerVerbIsFoundByExactName) {
  for (const char* verb : {"START", "STOP", "PAUSE", "RESUME", "CANCEL", "SERVER", "STATUS"}) {
    EXPECT_NE(AgentControlBase::handlerForVerb(verb), nullptr) << verb;
  }
  for (const char* verb : {"start", "X-PREVIEW", "XCMD", "ERR", ""}) {
    EXPECT_EQ(AgentControlBase::handlerForVerb(verb), nullptr) << verb;
  }
}

}  // namespace
}  // namespace lmx

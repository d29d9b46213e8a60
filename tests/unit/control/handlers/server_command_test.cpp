// SERVER: the server's protocol and identity.
#include "control/handlers/server_command.h"

#include <gtest/gtest.h>

#include "record/agent_record.h"
#include "tests/unit/control/handlers/collected_replies.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using Replies = std::vector<std::string>;

class ServerCommandTest : public ::testing::Test {
 protected:
  ServerCommandTest() { context_->server.server_uuid.set("S1"); }
  void announce(const Dictionary& parameters) { server_.handleSERVER(&parameters); }

  testing::LogCapture log_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  ChannelContext held_{context_};
  testing::CollectedReplies replies_;
  ServerCommand server_{held_, replies_};
};

TEST_F(ServerCommandTest, SetsTheVersionWithoutReplyEvenWhenTheUuidDiffers) {
  announce({{"version", "2"}, {"server_uuid", "X"}});
  EXPECT_TRUE(replies_.all().empty());
  EXPECT_EQ(server_.server_protocol_version(), 2);
  EXPECT_TRUE(log_.contains(kLogInfo, "Server UUID does not match"));
}

TEST_F(ServerCommandTest, ServerOfOurOwnIsNamedInTheLog) {
  announce({{"version", "3"}, {"server_uuid", "S1"}});
  EXPECT_TRUE(replies_.all().empty());
  EXPECT_EQ(server_.server_protocol_version(), 3);
  EXPECT_TRUE(log_.contains(kLogInfo, "Server is: S1"));
}

TEST_F(ServerCommandTest, WithoutAParameterItIsRefused) {
  announce({{"version", "2"}});
  announce({{"server_uuid", "S1"}});
  server_.handleSERVER(nullptr);
  EXPECT_EQ(replies_.all(), Replies(3, "cmdStatus=31"));
  EXPECT_EQ(server_.server_protocol_version(), 0);
}

}  // namespace
}  // namespace lmx

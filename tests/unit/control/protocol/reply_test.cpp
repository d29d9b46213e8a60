// The text that answers a command.
#include "control/protocol/reply.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(Reply, NamesTheCode) {
  EXPECT_EQ(replyText(CommandError::none), "cmdStatus=0");
  EXPECT_EQ(replyText(CommandError::noSession), "cmdStatus=1");
  EXPECT_EQ(replyText(CommandError::missingParameter), "cmdStatus=31");
  EXPECT_EQ(replyText(CommandError::notAuthenticated), "cmdStatus=36");
  EXPECT_EQ(replyText(CommandError::noSuchTimer), "cmdStatus=37");
  EXPECT_EQ(replyText(CommandError::timerRevoked), "cmdStatus=38");
  EXPECT_EQ(replyText(kRecordNoDiskSpace), "cmdStatus=30");
  EXPECT_EQ(replyText(-1), "cmdStatus=-1");
}

}  // namespace
}  // namespace lmx

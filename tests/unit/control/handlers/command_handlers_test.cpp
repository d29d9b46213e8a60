// The table from verb to handler.
#include "control/handlers/command_handlers.h"

#include <gtest/gtest.h>

#include "record/agent_record.h"
#include "tests/unit/control/handlers/collected_replies.h"

namespace lmx {
namespace {

TEST(Verbs, AreFoundByExactName) {
  const ChannelContext held(newAgentContext());
  testing::CollectedReplies replies;
  const CommandHandlers handlers(held, nullptr, replies, ChannelKind::detached);
  for (const char* verb : {"START", "STOP", "PAUSE", "RESUME", "CANCEL", "SERVER", "STATUS", "TIMEDCMD"})
    EXPECT_NE(handlers.verbs().handlerForVerb(verb), nullptr) << verb;
  for (const char* verb : {"start", "X-PREVIEW", "XCMD", "ERR", ""})
    EXPECT_EQ(handlers.verbs().handlerForVerb(verb), nullptr) << verb;
}

}  // namespace
}  // namespace lmx

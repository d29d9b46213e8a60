// The line by which the agent introduces itself.
#include "control/tunnel/hello.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(Hello, TellsWhoAndWhetherItCanRecord) {
  EXPECT_EQ(helloLine("C-1", "dmVjdG9y", true), "AGENT protocol=1,agent_uuid=C-1,iv=dmVjdG9y,version=100\n");
  EXPECT_EQ(helloLine("C-1", "*", false),
            "AGENT protocol=1,agent_uuid=C-1,iv=*,version=100,agent_recording_status=offline\n");
  EXPECT_EQ(helloLine(std::nullopt, "*", true), "AGENT protocol=1,agent_uuid=(null),iv=*,version=100\n");
}

}  // namespace
}  // namespace lmx

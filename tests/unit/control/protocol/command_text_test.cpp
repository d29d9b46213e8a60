// What is trimmed, what is counted, what is hidden from the log.
#include "control/protocol/command_text.h"

#include <gtest/gtest.h>

#include <limits>

namespace lmx {
namespace {

TEST(CommandText, LineBreaksAreTrimmedAtBothEndsOnly) {
  EXPECT_EQ(trimLineBreaks("\r\n\v\fSTATUS\u0085\u2028\u2029\r\n"), "STATUS");
  EXPECT_EQ(trimLineBreaks("A\nB"), "A\nB");
  EXPECT_EQ(trimLineBreaks(" A "), " A ");
  EXPECT_EQ(trimLineBreaks("\n\r\n"), "");
}

TEST(CommandText, PasswordsAreStarsInTheLog) {
  EXPECT_EQ(withoutSecrets("START a=1,RecordingMetadata_AGENT_PASSWORD=open sesame=,b=2"),
            "START a=1,RecordingMetadata_AGENT_PASSWORD=****,b=2");
  EXPECT_EQ(withoutSecrets("START RecordingMetadata_AGENT_PASSWORD=a,RecordingMetadata_AGENT_PASSWORD=b"),
            "START RecordingMetadata_AGENT_PASSWORD=****,RecordingMetadata_AGENT_PASSWORD=****");
  EXPECT_EQ(withoutSecrets("START a=1"), "START a=1");
}

}  // namespace
}  // namespace lmx

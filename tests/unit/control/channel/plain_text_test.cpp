// Commands as plain text.
#include "control/channel/plain_text.h"

#include <gtest/gtest.h>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

TEST(PlainText, LineThatIsNotUtf8IsIgnoredWithAnErrorLine) {
  testing::LogCapture log;
  EXPECT_EQ(plainCommand("STATUS\n", nullptr), "STATUS\n");
  EXPECT_EQ(plainCommand("START title=H\xF6rsaal\n", nullptr), std::nullopt);
  EXPECT_TRUE(log.contains(kLogError, "Command ignored because it is not UTF-8 text"));
}

}  // namespace
}  // namespace lmx

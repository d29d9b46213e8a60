// Lines in, replies out, in plain text.
#include "control/channel/plain_text.h"

#include <gtest/gtest.h>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

TEST(PlainText, AsManyBytesAsCharactersGoOut) {
  EXPECT_EQ(plainReplyBytes("cmdStatus=0"), "cmdStatus=0");
  EXPECT_EQ(plainReplyBytes("CameraName=Hörsaal,x=12"), "CameraName=Hörsaal,x=1");
}

TEST(PlainText, LineThatIsNotUtf8IsIgnoredWithAnErrorLine) {
  testing::LogCapture log;
  EXPECT_EQ(plainCommand("STATUS\n", nullptr), "STATUS\n");
  EXPECT_EQ(plainCommand("START title=H\xF6rsaal\n", nullptr), std::nullopt);
  EXPECT_TRUE(log.contains(3, "Command ignored because it is not UTF-8 text"));
}

}  // namespace
}  // namespace lmx

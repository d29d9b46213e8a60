// The server's side of the tunnel.
#include <gtest/gtest.h>

#include <fstream>

#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/temporary_directory.h"
#include "tools/lmx-tunnel/server_side.h"

namespace lmx {
namespace {

constexpr const char* kVector = "EBESExQVFhcYGRobHB0eHw==";

TEST(ParseHello, ParsesAnAgentsHello) {
  const auto hello =
      parseHello("AGENT protocol=1,agent_uuid=C-1,iv=" + std::string(kVector) + ",version=100");
  ASSERT_TRUE(hello);
  EXPECT_EQ(hello->agentUUID, "C-1");
  EXPECT_EQ(hello->version, "100");
  EXPECT_EQ(hello->vector[0], 0x10);
  EXPECT_EQ(hello->vector[15], 0x1F);
  EXPECT_FALSE(hello->offline);
  EXPECT_TRUE(parseHello("AGENT protocol=1,agent_uuid=C-1,iv=" + std::string(kVector) +
                         ",version=100,agent_recording_status=offline")
                  ->offline);
}

TEST(ParseHello, RejectsOtherLines) {
  for (const char* line : {"", "AGENT", "HELLO protocol=1", "AGENT protocol=2,iv=EBESExQVFhcYGRobHB0eHw==",
                           "AGENT protocol=1,agent_uuid=C", "AGENT protocol=1,iv=QUJD"}) {
    EXPECT_FALSE(parseHello(line)) << line;
  }
}

TEST(TunnelCipher, DecryptsOnlyItsOwnLines) {
  const testing::LogCapture log;
  const TunnelCipher cipher({1, 2, 3}, {4, 5, 6});
  const auto line = cipher.encrypted("STATUS include_profile=true");
  ASSERT_TRUE(line && line->ends_with("\n"));
  EXPECT_NE(line, cipher.encrypted("STATUS include_profile=true"));
  EXPECT_EQ(cipher.decrypted(*line), "STATUS include_profile=true");
  EXPECT_FALSE(cipher.decrypted("garbage"));
}

TEST(Preview, IsExtractedFromAReply) {
  const std::string reply = "cmdStatus=0,audio-level-left=1.0,preview-size=8,preview=anBlZyE=";
  EXPECT_EQ(previewIn(reply), "jpeg!");
  EXPECT_EQ(shortened(reply), "cmdStatus=0,audio-level-left=1.0,preview-size=8,preview=(8 characters)");
  EXPECT_FALSE(previewIn("cmdStatus=0"));
  EXPECT_EQ(shortened("cmdStatus=0"), "cmdStatus=0");
}

TEST(GetsReply, NotificationsGetNoReply) {
  EXPECT_TRUE(getsReply("STATUS"));
  EXPECT_FALSE(getsReply("SERVER version=2"));
  EXPECT_FALSE(getsReply("X-PREVIEW refresh_milliseconds=1"));
}

TEST(Secret, IsReadAsTheAgentReadsIt) {
  const testing::TemporaryDirectory folder;
  const auto read = [&](const std::string& content) {
    std::ofstream(folder.file("s.plist")) << content;
    const auto key = readSecret(folder.file("s.plist"));
    EXPECT_TRUE(key || !key.error().message.empty());
    return key.ok();
  };
  const auto plist = [](const std::string& text) {
    return "<plist version=\"1.0\"><dict><key>lmx_secret</key><string>" + text + "</string></dict></plist>";
  };
  EXPECT_TRUE(read(plist(kVector)));
  EXPECT_FALSE(read(plist("QUJD")));
  EXPECT_FALSE(read("<plist version=\"1.0\"><dict/></plist>"));
  EXPECT_FALSE(read("half"));
}

}  // namespace
}  // namespace lmx

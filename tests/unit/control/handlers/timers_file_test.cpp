// The timers file: what is written can be read, and what can't be read is named.
#include "control/handlers/timers_file.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

namespace lmx {
namespace {

class TimersFileTest : public ::testing::Test {
 protected:
  ~TimersFileTest() override { ::unlink(file_.path().c_str()); }
  TimerEntries readText(const std::string& text) {
    std::ofstream(file_.path()) << text;
    return file_.read();
  }
  TimersFile file_{::testing::TempDir() + "timers_" + std::to_string(::getpid())};
};

TEST_F(TimersFileTest, AMissingFileIsAnEmptyList) {
  const TimerEntries read = file_.read();
  EXPECT_TRUE(read.entries.empty());
  EXPECT_EQ(read.problem, "");
}

TEST_F(TimersFileTest, WhatIsWrittenIsRead) {
  const auto entry = std::make_shared<const Dictionary>(Dictionary{{"command", "STOP"}, {"title", "A & B"}});
  ASSERT_TRUE(file_.write({entry}));
  const TimerEntries read = file_.read();
  ASSERT_EQ(read.entries.size(), 1U);
  EXPECT_EQ(*read.entries[0], *entry);
  EXPECT_EQ(read.problem, "");
}

TEST_F(TimersFileTest, AnOlderFileIsClosedToOthersWhenItIsReplaced) {
  readText("");
  std::filesystem::permissions(file_.path(), std::filesystem::perms::all);
  ASSERT_TRUE(file_.write({}));
  EXPECT_EQ(std::filesystem::status(file_.path()).permissions(),
            std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
}

TEST_F(TimersFileTest, AnUnwritablePlaceIsReported) {
  EXPECT_FALSE(TimersFile("/nowhere/at/all/timers").write({}));
}

TEST_F(TimersFileTest, NoPropertyListIsAProblem) { EXPECT_NE(readText("timers!").problem, ""); }

TEST_F(TimersFileTest, AnotherTopLevelIsAProblem) {
  EXPECT_EQ(readText("<plist version=\"1.0\"><string>x</string></plist>").problem,
            "its top level is not an array");
}

TEST_F(TimersFileTest, WhatIsReadableAmongOtherThingsIsKept) {
  const TimerEntries read = readText(
      "<plist version=\"1.0\"><array><string>x</string><dict><key>command</key><string>STOP</string></dict>"
      "<dict><key>command</key><integer>1</integer></dict></array></plist>");
  ASSERT_EQ(read.entries.size(), 1U);
  EXPECT_EQ(lookUp(read.entries[0], "command"), "STOP");
  EXPECT_EQ(read.problem, "not all of its elements are dictionaries of strings");
}

}  // namespace
}  // namespace lmx

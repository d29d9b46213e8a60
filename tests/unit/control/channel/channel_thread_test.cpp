// The thread of a channel: its beginning, its wake-up and its end.
#include "control/channel/channel_thread.h"

#include <gtest/gtest.h>

#include "platform/net/socket_io.h"
#include "tests/unit/doubles/journal.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

TEST(ChannelThread, BeginsBehindItsAnnouncement) {
  testing::Journal journal;
  ChannelThread thread;
  ASSERT_TRUE(thread.start([&] { journal.add("body"); }, [&] { journal.add("announced"); }));
  EXPECT_TRUE(thread.waitUntilEnded());
  EXPECT_EQ(journal.entries(), (std::vector<std::string>{"announced", "body"}));
  EXPECT_TRUE(thread.hasEnded());
}

TEST(ChannelThread, AskedToStopItWakes) {
  ChannelThread thread;
  Readiness seen = Readiness::failed;
  ASSERT_TRUE(thread.start([&] { seen = awaitReadable(-1, thread.wakeDescriptor(), 30s); }, [] {}));
  EXPECT_FALSE(thread.hasEnded());
  EXPECT_TRUE(thread.running());
  thread.askToStop();
  EXPECT_FALSE(thread.running());
  EXPECT_TRUE(thread.waitUntilEnded());
  EXPECT_EQ(seen, Readiness::woken);
}

TEST(ChannelThread, KnowsItself) {
  ChannelThread thread;
  bool current = false;
  ASSERT_TRUE(thread.start([&] { current = thread.isCurrent(); }, [] {}));
  thread.waitUntilEnded();
  EXPECT_TRUE(current);
  EXPECT_FALSE(thread.isCurrent());
}

TEST(ChannelThread, OneThatNeverBeganHasEnded) {
  ChannelThread thread;
  EXPECT_TRUE(thread.canBeStopped());
  EXPECT_TRUE(thread.hasEnded());
  EXPECT_FALSE(thread.running());
  EXPECT_FALSE(thread.waitUntilEnded());
}

}  // namespace
}  // namespace lmx

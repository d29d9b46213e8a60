// Replies on their way to the channel's thread.
#include "control/channel/outbox.h"

#include <gtest/gtest.h>

#include "platform/net/socket_io.h"

namespace lmx {
namespace {

TEST(Outbox, GivesAllInTheirOrderAndOnlyOnce) {
  Outbox outbox;
  ASSERT_TRUE(outbox.usable());
  EXPECT_FALSE(isReadable(outbox.descriptor()));
  EXPECT_TRUE(outbox.push({"first", 1}));
  EXPECT_TRUE(outbox.push({"second", 2}));
  EXPECT_TRUE(isReadable(outbox.descriptor()));
  const auto taken = outbox.takeAll();
  ASSERT_EQ(taken.size(), 2U);
  EXPECT_EQ(taken[0].reply, "first");
  EXPECT_EQ(taken[1].connection, 2U);
  EXPECT_FALSE(isReadable(outbox.descriptor()));
  EXPECT_TRUE(outbox.takeAll().empty());
}

TEST(Outbox, AFullOneTakesNoMoreUntilItIsEmptied) {
  Outbox outbox(2);
  EXPECT_TRUE(outbox.push({"1", 1}));
  EXPECT_TRUE(outbox.push({"2", 1}));
  EXPECT_FALSE(outbox.push({"3", 1}));
  EXPECT_EQ(outbox.takeAll().size(), 2U);
  EXPECT_TRUE(outbox.push({"4", 1}));
}

TEST(Outbox, OneFullOfBytesTakesNoMoreEither) {
  Outbox outbox;
  const std::string half(kOutboxBytes / 2, 'x');
  EXPECT_TRUE(outbox.push({half, 1}));
  EXPECT_TRUE(outbox.push({half, 1}));
  EXPECT_FALSE(outbox.push({"x", 1}));
  EXPECT_EQ(outbox.takeAll().size(), 2U);
  EXPECT_TRUE(outbox.push({half, 1}));
}

}  // namespace
}  // namespace lmx

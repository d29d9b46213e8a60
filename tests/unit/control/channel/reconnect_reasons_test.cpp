// When a channel gives up a connection whose peer is still there.
#include "control/channel/reconnect_reasons.h"

#include <gtest/gtest.h>

#include "record/agent_record.h"
#include "tests/unit/control/channel/turned_clock.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

TEST(LastContact, IsLostAfterMoreThanTenMinutes) {
  const TimeValue last{1000, 500000};
  EXPECT_FALSE(contactIsLost({1600, 500000}, last));
  EXPECT_FALSE(contactIsLost({1600, 500999}, last));
  EXPECT_TRUE(contactIsLost({1600, 501000}, last));
  EXPECT_FALSE(contactIsLost({900, 0}, last));
}

class Reconnect : public ::testing::Test {
 protected:
  Reconnect() { clock_.frozen_at = 5000; }
  void contactAt(std::int64_t seconds) { context_.session()->lastContact.set(TimeValue{seconds, 0}); }

  testing::LogCapture log_;
  testing::TurnedClock clock_;
  std::shared_ptr<AgentContext> agent_ = newAgentContext();
  ChannelContext context_{agent_};
  ReconnectReasons reasons_{context_, clock_};
};

TEST_F(Reconnect, WithoutAReasonItStays) { EXPECT_FALSE(reasons_.mustReconnect()); }

TEST_F(Reconnect, ANetworkChangeIsActedUponOnceInALaterSecond) {
  reasons_.networkChanged();
  EXPECT_TRUE(log_.contains(kLogInfo, "A network transition was received."));
  EXPECT_FALSE(reasons_.mustReconnect());
  clock_.frozen_at = 5001;
  EXPECT_TRUE(reasons_.mustReconnect());
  EXPECT_TRUE(log_.contains(kLogDebug, "The connection is made anew after a network change"));
  EXPECT_FALSE(reasons_.mustReconnect());
}

TEST_F(Reconnect, ContactLostForTenMinutesIsActedUponOnce) {
  contactAt(4400);
  EXPECT_FALSE(reasons_.mustReconnect());
  clock_.frozen_at = 5001;
  EXPECT_TRUE(reasons_.mustReconnect());
  EXPECT_TRUE(log_.contains(kLogNotice, "Too long since last contact from server.  Reconnecting..."));
  EXPECT_FALSE(reasons_.mustReconnect());
}

TEST_F(Reconnect, WithoutSessionContactIsNeverLost) {
  contactAt(1);
  agent_->releaseRecord();
  EXPECT_FALSE(reasons_.mustReconnect());
}

TEST_F(Reconnect, WithoutTheTimeNothingIsLost) {
  reasons_.networkChanged();
  contactAt(1);
  clock_.readable = false;
  EXPECT_FALSE(reasons_.mustReconnect());
}

}  // namespace
}  // namespace lmx

// A channel's life: start, back-off, reconnects, chunks, and stop.
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <condition_variable>
#include <deque>
#include <functional>
#include <latch>
#include <thread>

#include "tests/unit/control/channel/scripted_channel.h"
#include "tests/unit/control/channel/turned_clock.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Journal;
using testing::LogCapture;
using testing::ScriptedActions;
using testing::ScriptedChannel;
using testing::TurnedClock;
using Lines = std::vector<std::string>;

/// Hands the channel one end of a new socket pair for each connection that the test allows.
class Connections {
 public:
  /// @return the peer's end of connection number `index`, waiting until it exists; -1, failing the test, when
  /// it never comes.
  int peer(std::size_t index) {
    std::unique_lock lock(mutex_);
    allowed_ = std::max(allowed_, index + 1);
    changed_.notify_all();
    const auto limit = std::chrono::system_clock::now() + 30s;
    if (!changed_.wait_until(lock, limit, [&] { return peers_.size() > index; })) {
      ADD_FAILURE() << "the channel never made connection " << index;
      return -1;
    }
    return peers_[index].get();
  }
  /// The channel's connect.
  int connect(ScriptedChannel& channel) {
    std::unique_lock lock(mutex_);
    // Returns now and then without a connection, so that stop() is noticed.
    if (!changed_.wait_until(lock, std::chrono::system_clock::now() + 100ms,
                             [&] { return peers_.size() < allowed_; })) {
      return -1;
    }
    std::array<int, 2> ends{};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0) return -1;
    if (!peers_.empty()) old_open_at_connect_ = isOpen(peers_.back().get());
    channel.useSocket(ends[0]);
    peers_.emplace_back(ends[1]);
    changed_.notify_all();
    return 0;
  }
  /// Whether the channel still held its end of the previous connection when it made the last one.
  bool oldWasOpenAtConnect() {
    const std::lock_guard lock(mutex_);
    return old_open_at_connect_;
  }
  static bool isOpen(int peer) {
    pollfd asked{peer, POLLIN, 0};
    return ::poll(&asked, 1, 0) == 0;
  }
  /// Waits until the channel has closed its end.
  static bool closes(int peer) {
    pollfd asked{peer, POLLIN, 0};
    std::array<char, 256> rest{};
    while (::poll(&asked, 1, 30000) == 1) {
      if (::recv(peer, rest.data(), rest.size(), 0) <= 0) return true;
    }
    return false;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  std::size_t allowed_ = 1;  // guarded by mutex_, as all that follow
  std::deque<UniqueFd> peers_;
  bool old_open_at_connect_ = false;
};

void say(int peer, std::string_view text) {
  EXPECT_EQ(::send(peer, text.data(), text.size(), MSG_NOSIGNAL), static_cast<ssize_t>(text.size()));
}

class Lifecycle : public ::testing::Test {
 protected:
  Lifecycle() {
    channel_.on_connect = [this](ScriptedChannel& channel) { return connections_.connect(channel); };
  }
  void start() { ASSERT_TRUE(channel_.initWithAgentContext()); }

  LogCapture log_;
  TurnedClock clock_;
  Connections connections_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  Journal journal_;
  ScriptedActions actions_{journal_};
  ScriptedChannel channel_{context_, &actions_, clock_};
};

TEST_F(Lifecycle, StartIsLogged) {
  start();
  EXPECT_TRUE(log_.contains(kLogNotice, "Control module is starting..."));
  EXPECT_TRUE(log_.contains(kLogNotice, "Control module started with success"));
}

TEST_F(Lifecycle, NoChannelWithoutNewsOfTheNetwork) {
  actions_.network_can_be_watched = false;
  EXPECT_FALSE(channel_.initWithAgentContext());
  EXPECT_TRUE(log_.contains(
      kLogError, "Unable to create dynamic store for Netvane registration for Network Notification"));
  EXPECT_TRUE(log_.contains(kLogError, "Unable to register for network notifications"));
  EXPECT_FALSE(log_.contains(kLogNotice, "Control module started with success"));
}

TEST_F(Lifecycle, NoChannelWithoutTheTime) {
  clock_.readable = false;
  EXPECT_FALSE(channel_.initWithAgentContext());
  EXPECT_TRUE(log_.contains(kLogCritical, "Internal error occurred"));
}

TEST_F(Lifecycle, CommandsOfAConnectionAreExecuted) {
  start();
  say(connections_.peer(0), "foo\n");
  EXPECT_TRUE(log_.waitFor(kLogError, "Unknown command [foo]"));
}

TEST_F(Lifecycle, SilentTunnelIsRetriedAfter5And15And45And120And120Seconds) {
  channel_.on_connect = [this](ScriptedChannel&) {
    clock_.sleeps.add("connect");
    return 1;
  };
  start();
  ASSERT_TRUE(log_.waitFor(kLogInfo, "Failed to connect to server, retrying in 120 seconds.", 2));
  channel_.stop();
  Lines retries;
  for (const auto& entry : log_.entries()) {
    if (entry.text.starts_with("Failed") && retries.size() < 5) retries.push_back(entry.text.substr(41));
  }
  EXPECT_EQ(retries, (Lines{"5 seconds.", "15 seconds.", "45 seconds.", "120 seconds.", "120 seconds."}));
}

TEST_F(Lifecycle, BackOffSleepsWithoutWakingMeanwhile) {
  channel_.on_connect = [this](ScriptedChannel&) {
    clock_.sleeps.add("connect");
    return 1;
  };
  start();
  ASSERT_TRUE(log_.waitFor(kLogInfo, "Failed to connect to server, retrying in 45 seconds."));
  channel_.stop();
  const Lines expected{"connect", "5000", "connect", "15000", "connect"};
  auto seen = clock_.sleeps.entries();
  seen.resize(std::min(seen.size(), expected.size()));
  EXPECT_EQ(seen, expected);
}

TEST_F(Lifecycle, ListenersFailureIsRetriedAtOnce) {
  std::atomic<int> attempts{0};
  channel_.on_connect = [&](ScriptedChannel& channel) {
    return ++attempts < 5 ? -1 : connections_.connect(channel);
  };
  start();
  connections_.peer(0);
  EXPECT_TRUE(clock_.sleeps.entries().empty());
  channel_.stop();
}

TEST(Stop, EndsABackOffEarly) {
  LogCapture log;
  ScriptedChannel channel(newAgentContext(), nullptr, systemChannelClock());
  channel.on_connect = [](ScriptedChannel&) { return 1; };
  ASSERT_TRUE(channel.initWithAgentContext());
  ASSERT_TRUE(log.waitFor(kLogInfo, "Failed to connect to server, retrying in 5 seconds."));
  const auto before = std::chrono::steady_clock::now();
  channel.stop();
  EXPECT_LT(std::chrono::steady_clock::now() - before, 2s);
}

TEST_F(Lifecycle, NetworkChangeMakesANewConnectionAndThenClosesTheOld) {
  start();
  const int first = connections_.peer(0);
  actions_.network_changed();
  clock_.ahead_seconds = 2;
  say(first, "x");  // one turn of the loop
  connections_.peer(1);
  EXPECT_TRUE(Connections::closes(first));
  EXPECT_TRUE(connections_.oldWasOpenAtConnect());
}

TEST_F(Lifecycle, ContactLostForTenMinutesReconnectsAndClearsTheTime) {
  start();
  const int first = connections_.peer(0);
  say(first, "foo\n");
  ASSERT_TRUE(log_.waitFor(kLogError, "Unknown command [foo]"));
  clock_.ahead_seconds = 601;
  say(first, "x");  // one turn of the loop, not yet a command
  connections_.peer(1);
  EXPECT_TRUE(log_.contains(kLogNotice, "Too long since last contact from server.  Reconnecting..."));
  EXPECT_FALSE(context_->record_context()->lastContact.get().has_value());
  EXPECT_TRUE(Connections::closes(first));
}

TEST_F(Lifecycle, PartialCommandOutlivesTheConnection) {
  start();
  say(connections_.peer(0), "fo");
  ::shutdown(connections_.peer(0), SHUT_WR);
  say(connections_.peer(1), "o\n");
  EXPECT_TRUE(log_.waitFor(kLogError, "Unknown command [foo]"));
}

TEST_F(Lifecycle, ClosedPeerIsReplacedByTheNext) {
  start();
  ::shutdown(connections_.peer(0), SHUT_WR);
  const int second = connections_.peer(1);
  EXPECT_TRUE(Connections::closes(connections_.peer(0)));
  say(second, "foo\n");
  EXPECT_TRUE(log_.waitFor(kLogError, "Unknown command [foo]"));
}

TEST_F(Lifecycle, OnlyTheFirstLineOfAChunkRunsUntilTheNextChunk) {
  channel_.receive("STOP\nfoo\n");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_FALSE(log_.mentions("Unknown command"));
  channel_.receive("bar\n");
  EXPECT_TRUE(log_.contains(kLogError, "Unknown command [foo\\nbar]"));
}

TEST_F(Lifecycle, LineOverTwoChunksRunsOnce) {
  channel_.receive("ST");
  EXPECT_TRUE(channel_.replies().empty());
  channel_.receive("OP\n");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
}

TEST_F(Lifecycle, AppendingIsLogged) {
  channel_.receive("ST");
  channel_.receive("OP");
  EXPECT_EQ(log_.count(kLogDebug, "Appending to existing partial command"), 1);
}

TEST_F(Lifecycle, CarriageReturnBeforeTheLineFeedIsTrimmed) {
  channel_.receive("STOP\r\n");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
}

TEST_F(Lifecycle, LineThatTheTransportRejectsIsIgnored) {
  channel_.readable_lines = false;
  channel_.receive("STATUS\n");
  EXPECT_TRUE(channel_.replies().empty());
  EXPECT_FALSE(context_->record_context()->lastContact.get().has_value());
  EXPECT_FALSE(log_.mentions("Command"));
}

TEST_F(Lifecycle, ChannelThatAsksForAuthenticationRefuses) {
  channel_.requires_authentication = true;
  channel_.receive("STATUS\n");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=36"});
}

TEST_F(Lifecycle, EndlessCommandIsDroppedWithOneErrorLine) {
  const std::string chunk(1024, 'x');
  for (int i = 0; i <= 1024; ++i) channel_.receive(chunk);
  EXPECT_EQ(log_.count(kLogError, "Command of more than 1048576 bytes without an end dropped"), 1);
  channel_.receive("STOP\n");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
}

TEST_F(Lifecycle, DisconnectIsLoggedAndClosesOnce) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, ends.data()), 0);
  const UniqueFd peer(ends[1]);
  channel_.useSocket(ends[0]);
  EXPECT_TRUE(channel_.connected());
  std::thread other([&] { channel_.disconnect(); });
  channel_.disconnect();
  other.join();
  EXPECT_TRUE(Connections::closes(peer.get()));
  EXPECT_FALSE(channel_.connected());
  EXPECT_EQ(log_.count(kLogInfo, "Disconnecting from tunnel..."), 2) << "both say so, one of them closes";
}

TEST_F(Lifecycle, DisconnectWithNothingOpenIsLoggedAllTheSame) {
  channel_.disconnect();
  EXPECT_EQ(log_.count(kLogInfo, "Disconnecting from tunnel..."), 1);
  channel_.disconnectOld();
  EXPECT_EQ(log_.count(kLogInfo, "Disconnecting from tunnel..."), 2);
}

TEST_F(Lifecycle, StopReturnsWhenTheThreadHasEndedAndTheSocketsAreClosed) {
  start();
  const int peer = connections_.peer(0);
  const auto before = std::chrono::steady_clock::now();
  channel_.stop();
  EXPECT_LT(std::chrono::steady_clock::now() - before, 1s);
  EXPECT_TRUE(channel_.threadHasEnded());
  EXPECT_TRUE(Connections::closes(peer));
  EXPECT_EQ(log_.count(kLogNotice, "Control module is stopping..."), 1);
}

TEST_F(Lifecycle, StopRightAfterTheStartIsNotLost) {
  start();
  channel_.stop();
  EXPECT_TRUE(channel_.threadHasEnded());
}

TEST_F(Lifecycle, StopFromSeveralThreadsIsOneStop) {
  start();
  connections_.peer(0);
  std::thread other([&] { channel_.stop(); });
  channel_.stop();
  other.join();
  EXPECT_TRUE(channel_.threadHasEnded());
}

TEST_F(Lifecycle, StopOnItsOwnThreadLetsGoOfTheContext) {
  channel_.on_reply = [](ScriptedChannel& channel) { channel.stop(); };
  start();
  const int peer = connections_.peer(0);
  say(peer, "STOP\n");
  EXPECT_TRUE(Connections::closes(peer));
  channel_.stop();
  EXPECT_TRUE(channel_.threadHasEnded());
  EXPECT_EQ(context_.use_count(), 1);
}

TEST_F(Lifecycle, AskedToStopTheChannelFinishesTheCommandItExecutes) {
  std::mutex mutex;
  std::condition_variable changed;
  bool replying = false;
  bool finish = false;
  channel_.on_reply = [&](ScriptedChannel&) {
    std::unique_lock lock(mutex);
    replying = true;
    changed.notify_all();
    changed.wait(lock, [&] { return finish; });
  };
  start();
  say(connections_.peer(0), "STOP\n");
  {
    std::unique_lock lock(mutex);
    changed.wait(lock, [&] { return replying; });
  }
  channel_.askToStop();
  EXPECT_FALSE(channel_.threadHasEnded());
  EXPECT_EQ(log_.count(kLogNotice, "Control module is stopping..."), 1) << "when it is asked for";
  {
    const std::lock_guard lock(mutex);
    finish = true;
    changed.notify_all();
  }
  channel_.stop();
  EXPECT_TRUE(channel_.threadHasEnded());
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_EQ(log_.count(kLogNotice, "Control module is stopping..."), 1);
}

/// A channel whose thread stands in the reply to a command until release().
class BusyChannel : public Lifecycle {
 protected:
  BusyChannel() {
    channel_.on_reply = [this](ScriptedChannel& channel) {
      threads_.push_back(std::this_thread::get_id());
      if (threads_.size() > 1) return;
      busy_.count_down();
      released_.wait();
      if (behind_the_reply_) behind_the_reply_(channel);
    };
    start();
    say(connections_.peer(0), "STOP\n");
    busy_.wait();
  }
  ~BusyChannel() override {
    release();
    channel_.stop();  // before what its replies reach is gone
  }
  void release() {
    if (!released_.try_wait()) released_.count_down();
  }
  bool waitForReplies(const Lines& expected) {
    return testing::waitUntil([&] { return channel_.replies() == expected; });
  }
  std::vector<std::thread::id> threads_;                    // channel thread only, while there is one
  std::function<void(ScriptedChannel&)> behind_the_reply_;  // set before release()

 private:
  std::latch busy_{1};
  std::latch released_{1};
};

TEST_F(BusyChannel, ReplyOfAnotherThreadDoesNotWaitAndIsSentByTheChannels) {
  channel_.sendReply("cmdStatus=38");
  channel_.sendReply("cmdStatus=4");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"}) << "the channel's thread is still busy";
  release();
  EXPECT_TRUE(waitForReplies({"cmdStatus=0", "cmdStatus=38", "cmdStatus=4"}));
  channel_.stop();
  EXPECT_EQ(threads_, std::vector(3, threads_.at(0)));
  EXPECT_NE(threads_.at(0), std::this_thread::get_id());
}

TEST_F(BusyChannel, AReplyBelongsToTheConnectionAtWhichItWasGiven) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
  const UniqueFd peer(ends[1]);
  behind_the_reply_ = [&](ScriptedChannel& channel) { channel.useSocket(ends[0]); };
  channel_.sendReply("cmdStatus=38");
  release();
  EXPECT_TRUE(log_.waitFor(
      kLogDebug,
      "Reply dropped because its peer has gone, has lost its place or does not read: cmdStatus=38"));
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
}

TEST_F(BusyChannel, APeerThatTakesNoMoreLosesWhatWaitsForIt) {
  channel_.takes_replies = false;
  channel_.sendReply("cmdStatus=1");
  channel_.sendReply("cmdStatus=2");
  release();
  EXPECT_TRUE(log_.waitFor(
      kLogDebug,
      "Reply dropped because its peer has gone, has lost its place or does not read: cmdStatus=2"));
  EXPECT_EQ(channel_.replies(), (Lines{"cmdStatus=0", "cmdStatus=1"}));
}

TEST_F(BusyChannel, WhatWasAnsweredBeforeTheStopIsStillSent) {
  channel_.sendReply("cmdStatus=38");
  channel_.askToStop();
  release();
  channel_.stop();
  EXPECT_EQ(channel_.replies(), (Lines{"cmdStatus=0", "cmdStatus=38"}));
}

TEST_F(BusyChannel, RepliesBeyondTheLimitAreDropped) {
  for (std::size_t i = 0; i <= kOutboxLimit; ++i) channel_.sendReply("cmdStatus=38");
  EXPECT_EQ(log_.count(kLogDebug, "Too many replies wait for the peer, one is dropped: cmdStatus=38"), 1);
  release();
  EXPECT_TRUE(testing::waitUntil([&] { return channel_.replies().size() == 1 + kOutboxLimit; }));
}

TEST_F(Lifecycle, AReplyWithNobodyThereIsADebugLine) {
  clock_.real_sleep = true;  // it stays in its back-off
  channel_.on_connect = [](ScriptedChannel&) { return 1; };
  start();
  channel_.sendReply("cmdStatus=38");
  EXPECT_TRUE(log_.contains(kLogDebug, "Nobody to send the reply to: cmdStatus=38"));
  channel_.stop();
  EXPECT_TRUE(channel_.replies().empty());
}

TEST_F(Lifecycle, HandlerThatThrowsCostsNeitherThreadNorConnection) {
  channel_.on_reply = [](ScriptedChannel&) { throw std::runtime_error("out of luck"); };
  start();
  say(connections_.peer(0), "STOP\n");
  ASSERT_TRUE(log_.waitFor(kLogCritical, "Internal error occurred: out of luck"));
  say(connections_.peer(0), "foo\n");
  EXPECT_TRUE(log_.waitFor(kLogError, "Unknown command [foo]"));
}

}  // namespace
}  // namespace lmx

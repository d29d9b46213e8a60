// Several peers on the local socket: who waits, who is set aside, and whose words are whose.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <deque>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "control/local/agent_control_unix.h"
#include "record/agent_record.h"
#include "support/dictionary.h"
#include "tests/unit/control/channel/turned_clock.h"
#include "tests/unit/control/local/local_peer.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/test_root.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::LocalPeer;

constexpr const char* kSetAside =
    "Nobody has said anything for some time: the present peer is set aside for the next";

constexpr const char* kTakenBack =
    "Nobody else is there: the peer that was set aside last has its place again";

/// Its steady time is turned by hand; it counts how often it is read, once for each turn of the loop.
class WatchedClock final : public testing::TurnedClock {
 public:
  std::atomic<int> reads{0};
  std::atomic<std::int64_t> passed_seconds{0};
  std::atomic<std::int64_t> hurry_seconds{0};  ///< what passes from one reading to the next

  std::chrono::steady_clock::time_point steadyNow() override {
    ++reads;
    passed_seconds += hurry_seconds;
    return std::chrono::steady_clock::now() + std::chrono::seconds(passed_seconds);
  }
};

class SeveralPeers : public ::testing::Test {
 protected:
  SeveralPeers() {
    context_->record_context()->filename.set("/tmp/lecture.mov");
    channel_ = newControlChannel<AgentControlUnix>(context_, &actions_, clock_);
  }
  /// Has `peer` said something and been answered.
  static bool isServed(LocalPeer& peer) {
    peer.send("STOP\n");
    return peer.receiveUpTo("cmdStatus=0") == "cmdStatus=0";
  }
  /// The present peer is set aside for one that does not stay.
  bool anotherComesAndLeaves() {
    LocalPeer next;
    letSilencePass();
    return isServed(next);
  }
  void letSilencePass() { clock_.passed_seconds += 11; }

  testing::LogCapture log_;
  testing::Journal journal_;
  testing::ScriptedActions actions_{journal_};
  WatchedClock clock_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::unique_ptr<AgentControlUnix> channel_;
};

TEST_F(SeveralPeers, ASilentOneIsSetAsideForTheNextAndStillHeard) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  LocalPeer next;
  letSilencePass();
  EXPECT_TRUE(isServed(next));
  EXPECT_EQ(log_.count(kLogDebug, kSetAside), 1);
  for (int i = 0; i < 3; ++i) {
    EXPECT_TRUE(isServed(silent)) << "at once, from wherever it is";
    EXPECT_TRUE(isServed(next));
  }
}

TEST_F(SeveralPeers, WhoeverSpeaksMakesTheNextWaitAgain) {
  LocalPeer first;
  ASSERT_TRUE(isServed(first));
  clock_.passed_seconds += 6;
  ASSERT_TRUE(isServed(first));
  clock_.passed_seconds += 6;
  LocalPeer next;
  next.send("PAUSE\n");
  ASSERT_TRUE(isServed(first));
  EXPECT_FALSE(log_.mentions("Command is [PAUSE]"));
  letSilencePass();
  EXPECT_EQ(next.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(SeveralPeers, AQueueOfSilentOnesIsDrainedAtOnce) {
  std::deque<LocalPeer> silent(200);
  LocalPeer last;
  last.send("STOP\n");
  letSilencePass();
  EXPECT_EQ(last.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_EQ(log_.count(kLogInfo, "More than 64 silent peers: the one that was set aside first is closed"),
            136);
  EXPECT_TRUE(silent.front().isClosed());
  EXPECT_TRUE(isServed(silent.back()));
  EXPECT_TRUE(isServed(silent[199 - 63])) << "the one set aside longest that is still there";
}

TEST_F(SeveralPeers, HalfALineStaysWithWhoSaidIt) {
  LocalPeer silent;
  silent.send("PAU");
  ASSERT_TRUE(testing::waitUntil([&] { return silent.isRead(); }));
  LocalPeer next;
  letSilencePass();
  EXPECT_TRUE(isServed(next));
  next.send("ST");
  silent.send("SE\n");
  EXPECT_EQ(silent.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_TRUE(log_.contains(kLogDebug, "Command is [PAUSE]"));
  ASSERT_TRUE(testing::waitUntil([&] { return next.isRead(); }));
  next.send("OP\n");
  EXPECT_EQ(next.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(SeveralPeers, HalfALineOfASetAsideOneThatHangsUpIsGone) {
  {
    LocalPeer silent;
    silent.send("PAU");
    ASSERT_TRUE(testing::waitUntil([&] { return silent.isRead(); }));
    LocalPeer next;
    letSilencePass();
    EXPECT_TRUE(isServed(next));
    silent.close();
  }
  LocalPeer another;
  EXPECT_TRUE(isServed(another));
}

TEST_F(SeveralPeers, HeldPlacesGoWithTheChannel) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  LocalPeer next;
  letSilencePass();
  ASSERT_TRUE(isServed(next));
  channel_->stop();
  EXPECT_TRUE(silent.isClosed());
  EXPECT_TRUE(next.isClosed());
}

TEST_F(SeveralPeers, WhenThePresentOneLeavesThoseSetAsideAreStillHeard) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  ASSERT_TRUE(anotherComesAndLeaves());
  EXPECT_TRUE(isServed(silent));
}

TEST_F(SeveralPeers, WhenThePresentOneLeavesATimedCommandAnswersTheOneSetAside) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  ASSERT_TRUE(anotherComesAndLeaves());
  ASSERT_TRUE(log_.waitFor(kLogDebug, kTakenBack));
  channel_->completeTimedCommand(std::make_shared<const Dictionary>(Dictionary{{"command", "STOP"}}));
  EXPECT_EQ(silent.receiveUpTo("cmdStatus=38"), "cmdStatus=38");
}

TEST_F(SeveralPeers, OneThatIsSilentForLongDoesNotMakeLaterOnesWait) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  ASSERT_TRUE(anotherComesAndLeaves());
  for (int i = 0; i < 3; ++i) {
    LocalPeer later;
    EXPECT_TRUE(isServed(later));
  }
  EXPECT_TRUE(isServed(silent));
}

TEST_F(SeveralPeers, HalfALineOfOneThatLeftIsForTheNextNewOne) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  {
    LocalPeer next;
    letSilencePass();
    ASSERT_TRUE(isServed(next));
    next.send("PA");
    ASSERT_TRUE(testing::waitUntil([&] { return next.isRead(); }));
  }
  ASSERT_TRUE(log_.waitFor(kLogDebug, kTakenBack));
  EXPECT_TRUE(isServed(silent));
  letSilencePass();
  LocalPeer another;
  another.send("USE\n");
  EXPECT_EQ(another.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_TRUE(log_.contains(kLogDebug, "Command is [PAUSE]"));
}

TEST_F(SeveralPeers, OneThatLostItsPlaceToANetworkChangeIsSetAsideForOneThatWas) {
  LocalPeer silent;
  ASSERT_TRUE(isServed(silent));
  LocalPeer present;
  letSilencePass();
  ASSERT_TRUE(isServed(present));
  actions_.network_changed();
  clock_.ahead_seconds += 2;
  ASSERT_TRUE(log_.waitFor(kLogDebug, "The connection is made anew after a network change"));
  EXPECT_TRUE(isServed(silent));
  EXPECT_TRUE(isServed(present));
}

TEST_F(SeveralPeers, NobodySpinsWhileOthersWaitOrAreSetAside) {
  LocalPeer first;
  ASSERT_TRUE(isServed(first));
  LocalPeer second;
  const auto turnsOfHalfASecond = [this] {
    const int before = clock_.reads;
    std::this_thread::sleep_for(500ms);
    return clock_.reads - before;
  };
  EXPECT_LT(turnsOfHalfASecond(), 5) << "one waits";
  letSilencePass();
  ASSERT_TRUE(isServed(second));
  LocalPeer third;
  letSilencePass();
  ASSERT_TRUE(isServed(third));
  EXPECT_LT(turnsOfHalfASecond(), 5) << "two are set aside";
  first.close();
  letSilencePass();
  EXPECT_LT(turnsOfHalfASecond(), 6) << "one of them has hung up";
  EXPECT_TRUE(isServed(second));
}

/// What a peer says, a piece at a time. Each piece ends at a line feed at the latest.
class Speech {
 public:
  Speech(const std::string& name, int lines, std::mt19937& random) {
    for (int i = 0; i < lines; ++i) {
      const std::string line = name + std::to_string(i) + std::string(random() % 20, 'x');
      lines_.push_back(line);
      text_ += line + "\n";
    }
  }
  [[nodiscard]] const std::vector<std::string>& lines() const { return lines_; }
  [[nodiscard]] bool done() const { return said_ == text_.size(); }
  /// The line that the last piece has ended; empty when it ended none.
  [[nodiscard]] std::string endedLine() const {
    if (said_ == 0 || text_[said_ - 1] != '\n') return {};
    const std::size_t before = said_ < 2 ? std::string::npos : text_.rfind('\n', said_ - 2);
    const std::size_t begin = before == std::string::npos ? 0 : before + 1;
    return text_.substr(begin, said_ - 1 - begin);
  }
  std::string_view nextPiece(std::mt19937& random) {
    const std::size_t end = text_.find('\n', said_) + 1;
    const std::size_t size = std::min<std::size_t>(1 + random() % 12, end - said_);
    const std::string_view piece = std::string_view(text_).substr(said_, size);
    said_ += size;
    return piece;
  }

 private:
  std::vector<std::string> lines_;
  std::string text_;
  std::size_t said_ = 0;
};

/// The unknown commands that were executed, by the letter that they begin with.
std::map<char, std::vector<std::string>> executed(const testing::LogCapture& log) {
  const std::string head = "Unknown command [";
  std::map<char, std::vector<std::string>> lines;
  for (const auto& entry : log.entries()) {
    if (!entry.text.starts_with(head)) continue;
    const std::string line = entry.text.substr(head.size(), entry.text.size() - head.size() - 1);
    lines[line.empty() ? '?' : line.front()].push_back(line);
  }
  return lines;
}

class Interleaving : public SeveralPeers, public ::testing::WithParamInterface<unsigned> {};

TEST_P(Interleaving, EveryLineIsExecutedOnceAndNoneIsMixed) {
  std::mt19937 random(GetParam());
  clock_.hurry_seconds = 11;  // the silence is always over: each that comes is taken on at once
  std::map<char, std::vector<std::string>> expected;
  std::vector<Speech> speeches;
  for (const char* name : {"a", "b", "c"}) {
    speeches.emplace_back(name, 40, random);
    expected[name[0]] = speeches.back().lines();
  }
  std::deque<LocalPeer> peers(speeches.size());
  const auto all_read = [&] {
    return std::all_of(peers.begin(), peers.end(), [](const LocalPeer& peer) { return peer.isRead(); });
  };
  for (std::size_t i = 0; i < peers.size(); ++i) peers[i].send(speeches[i].nextPiece(random));
  ASSERT_TRUE(testing::waitUntil(all_read)) << "each has been taken on";
  // Of two lines that come in one chunk only the first is executed: so each line is awaited before the next.
  const auto may_go_on = [&](std::size_t who) {
    const std::string ended = speeches[who].endedLine();
    if (speeches[who].done() || !peers[who].isRead()) return false;
    return ended.empty() || log_.contains(kLogError, "Unknown command [" + ended + "]");
  };
  while (!std::all_of(speeches.begin(), speeches.end(), [](const Speech& one) { return one.done(); })) {
    std::size_t who = 0;
    ASSERT_TRUE(testing::waitUntil([&] { return may_go_on(who = random() % peers.size()); }))
        << "a line is lost";
    peers[who].send(speeches[who].nextPiece(random));
  }
  ASSERT_TRUE(testing::waitUntil(all_read));
  channel_->stop();
  EXPECT_EQ(executed(log_), expected);
  EXPECT_GT(log_.count(kLogDebug, "A peer that was set aside speaks again"), 30);
}

INSTANTIATE_TEST_SUITE_P(Seeds, Interleaving, ::testing::Range(1U, 9U));

}  // namespace
}  // namespace lmx

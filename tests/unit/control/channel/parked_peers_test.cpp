// Peers that are set aside.
#include "control/channel/parked_peers.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <string_view>

namespace lmx {
namespace {

class Parked : public ::testing::Test {
 protected:
  /// Parks one more peer. @return its end
  UniqueFd park(std::string_view unfinished = {}) {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
    ParkedPeer peer{{UniqueFd(ends[0]), ++number_, true}, LineAssembler()};
    if (!unfinished.empty()) peer.line.feed(unfinished);
    all_kept_ = parked_.park(std::move(peer));
    return UniqueFd(ends[1]);
  }
  static void say(const UniqueFd& peer) { ASSERT_EQ(::send(peer.get(), "x", 1, MSG_NOSIGNAL), 1); }
  static bool isClosed(const UniqueFd& peer) {
    pollfd asked{peer.get(), POLLIN, 0};
    return ::poll(&asked, 1, 0) == 1 && (asked.revents & POLLHUP) != 0;
  }
  ParkedPeers parked_{3};
  std::uint64_t number_ = 0;
  bool all_kept_ = true;
};

TEST_F(Parked, SilentOnesStay) {
  const UniqueFd first = park();
  EXPECT_FALSE(parked_.takeSpeaking());
  EXPECT_EQ(parked_.size(), 1U);
}

TEST_F(Parked, OneThatSpeaksComesBackWithWhatItLeftUnfinished) {
  const UniqueFd first = park("ab");
  const UniqueFd second = park("cd");
  say(second);
  const auto speaking = parked_.takeSpeaking();
  ASSERT_TRUE(speaking);
  EXPECT_EQ(speaking->connection.number, 2U);
  EXPECT_EQ(speaking->line.partialCommand(), "cd");
  EXPECT_EQ(parked_.size(), 1U);
}

TEST_F(Parked, OfSeveralTheOneThatWasSetAsideFirstHasItsTurn) {
  const UniqueFd first = park();
  const UniqueFd second = park();
  say(second);
  say(first);
  EXPECT_EQ(parked_.takeSpeaking()->connection.number, 1U);
  EXPECT_EQ(parked_.takeSpeaking()->connection.number, 2U);
  EXPECT_FALSE(parked_.takeSpeaking());
}

TEST_F(Parked, OnesThatHangUpWithoutAWordAreClosed) {
  const UniqueFd first = park();
  { const UniqueFd gone = park(); }
  const UniqueFd third = park();
  say(third);
  EXPECT_EQ(parked_.takeSpeaking()->connection.number, 3U);
  EXPECT_EQ(parked_.size(), 1U);
}

TEST_F(Parked, TheLastWordsOfOneThatHangsUpAreHeard) {
  {
    const UniqueFd gone = park();
    say(gone);
  }
  EXPECT_TRUE(parked_.takeSpeaking());
}

TEST_F(Parked, BeyondTheLimitTheFirstOneIsClosed) {
  const UniqueFd first = park();
  const UniqueFd second = park();
  const UniqueFd third = park();
  EXPECT_TRUE(all_kept_);
  const UniqueFd fourth = park();
  EXPECT_FALSE(all_kept_);
  EXPECT_TRUE(isClosed(first));
  EXPECT_FALSE(isClosed(second));
  std::vector<int> polled;
  parked_.addDescriptors(polled);
  EXPECT_EQ(polled.size(), 3U);
}

}  // namespace
}  // namespace lmx

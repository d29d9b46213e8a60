// The local socket with real peers.
#include "control/local/agent_control_unix.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <latch>
#include <thread>

#include "platform/paths.h"
#include "record/agent_record.h"
#include "tests/unit/control/channel/turned_clock.h"
#include "tests/unit/control/local/local_peer.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/test_root.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using testing::Journal;
using testing::LocalPeer;
using testing::LogCapture;
using testing::ScriptedActions;
using testing::socketPath;
using Peer = LocalPeer;

class LocalSocket : public ::testing::Test {
 protected:
  void SetUp() override {
    context_->record_context()->filename.set("/tmp/lecture.mov");
    start();
  }
  void start() {
    channel_ = newControlChannel<AgentControlUnix>(context_, &actions_, clock_);
    ASSERT_NE(channel_, nullptr);
  }
  /// Some seconds ago.
  void changeNetwork() {
    actions_.network_changed();
    clock_.ahead_seconds += 2;
  }

  LogCapture log_;
  Journal journal_;
  ScriptedActions actions_{journal_};
  testing::TurnedClock clock_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::unique_ptr<AgentControlUnix> channel_;
};

TEST_F(LocalSocket, StatusReplyHasNoLineFeed) {
  context_->releaseRecord();
  Peer peer;
  peer.send("STATUS\n");
  const std::string status = peer.receiveUpTo("totalDiskInMB=0");
  peer.send("STOP\n");
  // Had anything stood behind the status, it would stand in front of the next reply.
  EXPECT_EQ(status + peer.receiveUpTo("cmdStatus=1"),
            "cmdStatus=2,recordStatus=0,start=0,elapsedTime=0,stop=0,hard_stop=0,lastError=0,"
            "availDiskInMB=0,totalDiskInMB=0cmdStatus=1");
}

TEST_F(LocalSocket, SetUpAndPeerAreLogged) {
  Peer peer;
  peer.send("STOP\n");
  peer.receiveUpTo("cmdStatus=0");
  EXPECT_TRUE(log_.contains(kLogInfo, "Connecting local pipe"));
  EXPECT_TRUE(log_.mentions("accepted connection fd = "));
}

TEST_F(LocalSocket, StaleSocketFileIsReplaced) {
  channel_.reset();
  // What a killed agent leaves: a bound socket's file that nobody listens on.
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  socketPath().copy(address.sun_path, sizeof address.sun_path - 1);
  {
    const UniqueFd stale(::socket(AF_UNIX, SOCK_STREAM, 0));
    ASSERT_EQ(::bind(stale.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  }
  ASSERT_TRUE(std::filesystem::exists(socketPath()));
  start();
  Peer peer;
  peer.send("STOP\n");
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, PlainFileInTheWayIsReplaced) {
  channel_.reset();
  std::ofstream(socketPath()) << "left over";
  start();
  Peer peer;
  peer.send("STOP\n");
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, SecondPeerWaitsUntilTheFirstHasLeft) {
  Peer first;
  first.send("STOP\n");
  ASSERT_EQ(first.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  Peer second;
  second.send("PAUSE\n");
  first.send("STOP\n");
  ASSERT_EQ(first.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_FALSE(second.hasReply(0ms));
  EXPECT_FALSE(log_.mentions("Command is [PAUSE]"));
  first.close();
  EXPECT_EQ(second.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, PartialCommandIsJoinedWithTheNextPeersLine) {
  {
    Peer first;
    first.send("ST");
  }
  Peer second;
  second.send("OP\n");
  EXPECT_EQ(second.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, PeerThatClosesAbruptlyMakesRoomForTheNext) {
  for (int i = 0; i < 20; ++i) {
    Peer rude;
    rude.send("STATUS\n");
    rude.closeAbruptly();
  }
  Peer peer;
  peer.send("STOP\n");
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, ReplyToAPeerThatIsGoneIsADebugLine) {
  channel_.reset();
  std::latch executing(1);
  std::latch peer_gone(1);
  actions_.on_stop_recording = [&] {
    executing.count_down();
    peer_gone.wait();
  };
  start();
  Peer peer;
  peer.send("STOP\n");
  executing.wait();
  peer.close();
  peer_gone.count_down();
  EXPECT_TRUE(log_.waitFor(kLogDebug, "Could not answer to tunnel (errno = 32)"));
}

TEST_F(LocalSocket, LineAByteAtATimeIsExecutedOnce) {
  Peer peer;
  for (const char byte : std::string("STOP\n")) peer.send(std::string_view(&byte, 1));
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_EQ(log_.count(kLogDebug, "Command is [STOP]"), 1);
}

TEST_F(LocalSocket, APeerThatLostItsPlaceToANetworkChangeIsHeardAgain) {
  Peer peer;
  peer.send("x\n");
  ASSERT_TRUE(log_.waitFor(kLogError, "Unknown command [x]"));
  changeNetwork();
  ASSERT_TRUE(log_.waitFor(kLogDebug, "The connection is made anew after a network change"));
  peer.send("STOP\n");
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_TRUE(log_.contains(kLogDebug, "The previous peer speaks again"));
  EXPECT_EQ(journal_.entries(), std::vector<std::string>{"stopRecording"});
}

TEST_F(LocalSocket, APeerThatLostItsPlaceMakesRoomForTheNext) {
  Peer first;
  first.send("x\n");
  ASSERT_TRUE(log_.waitFor(kLogError, "Unknown command [x]"));
  changeNetwork();
  ASSERT_TRUE(log_.waitFor(kLogDebug, "The connection is made anew after a network change"));
  Peer second;
  second.send("STOP\n");
  EXPECT_EQ(second.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  EXPECT_TRUE(first.isClosed());
}

TEST_F(LocalSocket, APeerThatIsGoneWithItsPlaceCostsNothing) {
  changeNetwork();  // the first peer loses its place as soon as it has it
  {
    const Peer first;
    ASSERT_TRUE(log_.waitFor(kLogDebug, "The connection is made anew after a network change"));
  }
  Peer second;
  second.send("STOP\n");
  EXPECT_EQ(second.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, TenMegabytesWithoutALineFeedLeaveTheChannelUsable) {
  Peer peer;
  const std::string block(1U << 20, 'x');
  for (int i = 0; i < 10; ++i) peer.send(block);
  ASSERT_TRUE(log_.waitFor(kLogError, "Command of more than 1048576 bytes without an end dropped", 9));
  peer.send("\n");  // ends what was left of it
  ASSERT_TRUE(log_.waitForPart("Unknown command [xxx"));
  peer.send("STOP\n");
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
}

TEST_F(LocalSocket, ReplyLongerThanTheSocketBufferArrivesWhole) {
  const std::string image = "/tmp/unit_control_image_" + std::to_string(::getpid());
  std::ofstream(image, std::ios::binary) << std::string(3U << 20, 'x');
  context_->recording.preview_file.set(image);
  Peer peer;
  peer.send("STATUS include_preview=true\n");
  const std::string reply = peer.receiveUpTo("eHh4");
  ::unlink(image.c_str());
  const std::string size = "preview-size=4194304,preview=";
  const auto found = reply.find(size);
  ASSERT_NE(found, std::string::npos);
  std::string preview = reply.substr(found + size.size());
  while (preview.size() < 4194304 && peer.hasReply(30s)) preview += peer.receiveUpTo("eHh4");
  EXPECT_EQ(preview.size(), 4194304U);
}

TEST_F(LocalSocket, RepliesBeyondAsciiAreWhole) {
  const std::string image = "/tmp/unit_control_image_" + std::to_string(::getpid());
  std::ofstream(image, std::ios::binary) << "abcdef";
  context_->server.machine_name.set("Hörsaal Süd");
  context_->recording.preview_file.set(image);
  Peer peer;
  peer.send("STATUS include_profile=true,include_preview=true\n");
  const std::string end = "preview-size=8,preview=YWJjZGVm";
  EXPECT_NE(peer.receiveUpTo(end).find(",CameraName=Hörsaal Süd,TunnelHost="), std::string::npos);
  ::unlink(image.c_str());
  peer.send("TIMEDCMD command=STOP,time=2100-01-01 00:00:00 +0000,TITLE=Größe\n");
  EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  peer.send("TIMEDCMD command=TIMERLIST\n");
  const std::string list = peer.receiveUpTo("</plist>\n");
  EXPECT_TRUE(list.ends_with("</plist>\n"));
  EXPECT_NE(list.find("<string>Größe</string>"), std::string::npos) << list;
}

TEST_F(LocalSocket, WhenTheLoopThrowsNobodyListensAnyMore) {
  Peer peer;
  peer.send("STOP\n");
  peer.receiveUpTo("cmdStatus=0");
  actions_.network_changed();
  clock_.ahead_seconds += 2;
  clock_.throws = true;
  ASSERT_TRUE(log_.waitFor(kLogCritical, "Control channel has ended: the clock has stopped"));
  EXPECT_TRUE(peer.isClosed());
  EXPECT_FALSE(std::filesystem::exists(socketPath()));
}

TEST_F(LocalSocket, StopReturnsAtOnceWhileWaitingForAPeer) {
  ASSERT_TRUE(log_.waitFor(kLogInfo, "Connecting local pipe"));
  const auto before = std::chrono::steady_clock::now();
  channel_->stop();
  EXPECT_LT(std::chrono::steady_clock::now() - before, 1s);
  EXPECT_TRUE(channel_->threadHasEnded());
}

TEST_F(LocalSocket, StopReturnsAtOnceWhileAPeerIsConnected) {
  Peer peer;
  peer.send("STOP\n");
  peer.receiveUpTo("cmdStatus=0");
  const auto before = std::chrono::steady_clock::now();
  channel_->stop();
  EXPECT_LT(std::chrono::steady_clock::now() - before, 1s);
  EXPECT_TRUE(peer.isClosed());
}

TEST_F(LocalSocket, DestructionRemovesTheSocketFile) {
  { Peer peer; }
  ASSERT_TRUE(std::filesystem::exists(socketPath()));
  channel_.reset();
  EXPECT_FALSE(std::filesystem::exists(socketPath()));
}

TEST_F(LocalSocket, SocketFileHasTheProcessesDefaultMode) {
  Peer peer;
  const mode_t mask = ::umask(0);
  ::umask(mask);
  struct stat file {};
  ASSERT_EQ(::stat(socketPath().c_str(), &file), 0);
  EXPECT_EQ(file.st_mode & 0777, 0777U & ~mask);
}

TEST_F(LocalSocket, ListenerThatCannotBeSetUpLeavesTheChannelWithoutAThread) {
  channel_.reset();
  const std::string directory = socketPath().substr(0, socketPath().rfind('/'));
  std::filesystem::rename(directory, directory + ".away");
  start();
  const auto deadline = std::chrono::steady_clock::now() + 30s;
  while (!channel_->threadHasEnded() && std::chrono::steady_clock::now() < deadline)
    std::this_thread::yield();
  EXPECT_TRUE(channel_->threadHasEnded());
  std::filesystem::rename(directory + ".away", directory);
}

TEST_F(LocalSocket, RestartBindsAgain) {
  for (int i = 0; i < 5; ++i) {
    channel_.reset();
    start();
    Peer peer;
    peer.send("STOP\n");
    EXPECT_EQ(peer.receiveUpTo("cmdStatus=0"), "cmdStatus=0");
  }
}

}  // namespace
}  // namespace lmx

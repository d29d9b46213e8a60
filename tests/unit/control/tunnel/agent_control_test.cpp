// The tunnel's channel against a server that the test plays on loopback.
#include "control/tunnel/agent_control.h"

#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <filesystem>
#include <iterator>
#include <thread>

#include "control/tunnel/message_cipher.h"
#include "record/agent_record.h"
#include "support/base64.h"
#include "support/unique_fd.h"
#include "tests/unit/control/channel/turned_clock.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

constexpr std::array<unsigned char, 16> kSecret{1, 2, 3, 4};

/// Listens on a port of the system's choice.
class PlayedServer {
 public:
  PlayedServer() : listener_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof address;
    EXPECT_EQ(::bind(listener_.get(), reinterpret_cast<const sockaddr*>(&address), size), 0);
    EXPECT_EQ(::listen(listener_.get(), 16), 0);
    EXPECT_EQ(::getsockname(listener_.get(), reinterpret_cast<sockaddr*>(&address), &size), 0);
    port_ = ntohs(address.sin_port);
  }
  [[nodiscard]] int port() const { return port_; }
  UniqueFd accept() {
    pollfd polled{listener_.get(), POLLIN, 0};
    EXPECT_EQ(::poll(&polled, 1, 20000), 1) << "nobody connects";
    return UniqueFd(::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
  }
  static std::string readLine(const UniqueFd& peer) {
    std::string line;
    pollfd polled{peer.get(), POLLIN, 0};
    char c = 0;
    while (!line.ends_with('\n') && ::poll(&polled, 1, 20000) == 1 && ::recv(peer.get(), &c, 1, 0) == 1)
      line += c;
    return line;
  }

 private:
  UniqueFd listener_;
  int port_ = 0;
};

class Tunnel : public ::testing::Test {
 protected:
  Tunnel() {
    context_->server.tunnel_host.set("127.0.0.1");
    context_->server.tunnel_port.set(std::to_string(server_.port()));
    context_->server.machine_uuid.set("C-1");
    context_->server.shared_secret.set(kSecret);
    context_->state.running.set(true);
  }
  static std::ptrdiff_t openDescriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
  }
  UniqueFd acceptWithHello() {
    UniqueFd peer = server_.accept();
    hello_ = PlayedServer::readLine(peer);
    EXPECT_TRUE(hello_.starts_with("AGENT protocol=1,agent_uuid=C-1,iv=")) << hello_;
    return peer;
  }
  std::string encrypted(const std::string& text) const {
    const std::string iv = hello_.substr(hello_.find("iv=") + 3, 24);
    const auto bytes = lmp_decode_base64(iv);
    CipherBlock vector{};
    std::copy(bytes->begin(), bytes->end(), vector.begin());
    return agent_encrypt_message(vector, kSecret, std::string(kRandomPrefix, 'r') + text).value() + "\n";
  }
  /// What the next line from the agent says.
  std::string readReply(const UniqueFd& peer) const {
    const auto bytes = lmp_decode_base64(hello_.substr(hello_.find("iv=") + 3, 24));
    CipherBlock vector{};
    std::copy(bytes->begin(), bytes->end(), vector.begin());
    return messageIn(agent_decrypt_message(vector, kSecret, PlayedServer::readLine(peer)).value_or(""));
  }
  static void send(const UniqueFd& peer, const std::string& bytes) {
    ASSERT_EQ(::send(peer.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL),
              static_cast<ssize_t>(bytes.size()));
  }

  testing::LogCapture log_;
  PlayedServer server_;
  testing::Journal journal_;
  testing::ScriptedActions actions_{journal_};
  testing::TurnedClock clock_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  AgentControl tunnel_{context_, &actions_, clock_};
  std::string hello_;
};

TEST_F(Tunnel, AThousandReconnectsLeakNoDescriptor) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  { const UniqueFd warm = acceptWithHello(); }
  const auto before = openDescriptors();
  const std::string first = hello_;
  for (int i = 0; i < 1000; ++i) {
    const UniqueFd peer = acceptWithHello();
    ASSERT_EQ(hello_, first) << "one vector for the life of the channel";
  }
  tunnel_.stop();
  EXPECT_LE(openDescriptors(), before);
}

TEST_F(Tunnel, TheOldConnectionIsClosedOnlyBehindTheNewOne) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd old = acceptWithHello();
  actions_.network_changed();
  clock_.ahead_seconds = 2;
  const UniqueFd peer = acceptWithHello();
  pollfd polled{old.get(), POLLIN, 0};
  ASSERT_EQ(::poll(&polled, 1, 20000), 1);
  char c = 0;
  EXPECT_EQ(::recv(old.get(), &c, 1, 0), 0);
}

TEST_F(Tunnel, ARefusalCountsOnlyWhenItCameInPieces) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd peer = acceptWithHello();
  send(peer, "ERR Unbound agent\n");
  ASSERT_TRUE(log_.waitFor(kLogCritical, "Internal error occurred during decryption"));
  // The answer proves that the whole line has been dealt with, and that what came behind its own line waits.
  send(peer, encrypted("STOP") + "ERR Unb");
  EXPECT_FALSE(PlayedServer::readLine(peer).empty());
  EXPECT_EQ(context_->state.serverRejectTime.get(), 0);
  send(peer, "ound agent\n");
  ASSERT_TRUE(log_.waitFor(kLogWarning, "Server rejected agent connection, sleeping for one minute."));
  // The time is set behind the line.
  ASSERT_TRUE(testing::waitUntil([&] { return tunnel_.threadHasEnded(); }));
  EXPECT_NEAR(static_cast<double>(context_->state.serverRejectTime.get()),
              static_cast<double>(std::time(nullptr)), 2.0);
}

TEST_F(Tunnel, InItsBackOffItHearsThePreviousConnection) {
  clock_.real_sleep = true;
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd old = acceptWithHello();
  context_->server.tunnel_port.set("9");  // nobody there
  actions_.network_changed();
  clock_.ahead_seconds = 2;
  ASSERT_TRUE(log_.waitFor(kLogInfo, "Failed to connect to server, retrying in 5 seconds."));
  send(old, encrypted("STOP"));
  EXPECT_FALSE(PlayedServer::readLine(old).empty());
  EXPECT_EQ(journal_.entries(), std::vector<std::string>{"stopRecording"});
}

TEST_F(Tunnel, AReplyBeforeTheHelloIsNotSent) {
  tunnel_.completeTimedCommand(std::make_shared<const Dictionary>(Dictionary{{"command", "STOP"}}));
  EXPECT_TRUE(log_.contains(kLogDebug, "No reply before the hello: cmdStatus=38"));
}

TEST_F(Tunnel, ATimedCommandsReplyGoesOverTheOpenTunnel) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd peer = acceptWithHello();
  send(peer, encrypted("STOP"));  // its reply proves that the hello is done
  EXPECT_EQ(readReply(peer), "cmdStatus=0");
  tunnel_.completeTimedCommand(std::make_shared<const Dictionary>(Dictionary{{"command", "STOP"}}));
  EXPECT_EQ(readReply(peer), "cmdStatus=38");
}

TEST_F(Tunnel, RepliesBeyondAsciiAreWhole) {
  context_->server.machine_name.set("Hörsaal Süd");
  context_->recording.capture_preset.set("Größe");
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd peer = acceptWithHello();
  send(peer, encrypted("STATUS include_profile=true"));
  EXPECT_TRUE(
      readReply(peer).ends_with(",CameraName=Hörsaal Süd,TunnelHost=127.0.0.1,RecordingCapturePreset=Größe"));
}

TEST_F(Tunnel, AServerThatSpeaksAndHangsUpIsNotCalledAgainAtOnce) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  for (int i = 0; i < 3; ++i) {
    const UniqueFd peer = acceptWithHello();
    send(peer, encrypted("STOP"));
    EXPECT_EQ(readReply(peer), "cmdStatus=0");
  }
  const UniqueFd last = acceptWithHello();
  EXPECT_EQ(clock_.sleeps.entries(), (std::vector<std::string>{"5000", "5000", "5000"}));
}

TEST_F(Tunnel, AServerThatHangsUpLaterIsCalledAgainAtOnce) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  {
    const UniqueFd peer = acceptWithHello();
    clock_.ahead_seconds = 6;
  }
  const UniqueFd again = acceptWithHello();
  EXPECT_TRUE(clock_.sleeps.entries().empty());
}

TEST_F(Tunnel, CommandsAreDecryptedAndAnswered) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd peer = acceptWithHello();
  send(peer, encrypted("STOP"));
  EXPECT_EQ(PlayedServer::readLine(peer).size(), (32 + 11 + 5) / 3 * 4 + 1U);
  EXPECT_EQ(journal_.entries(), std::vector<std::string>{"stopRecording"});
}

TEST_F(Tunnel, AnOfflineAgentSaysSo) {
  context_->state.running.set(false);
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  acceptWithHello();
  EXPECT_TRUE(hello_.ends_with(",version=100,agent_recording_status=offline\n")) << hello_;
  EXPECT_TRUE(testing::waitUntil([&] { return context_->state.agent_sent_or_fail.get(); }));
}

TEST_F(Tunnel, TenMinutesWithoutContactMakeANewConnection) {
  ASSERT_TRUE(tunnel_.initWithAgentContext());
  const UniqueFd old = acceptWithHello();
  context_->record_context()->lastContact.set(lmp_gettimeofday());
  clock_.ahead_seconds = 601;
  const UniqueFd peer = acceptWithHello();
  EXPECT_TRUE(log_.contains(kLogNotice, "Too long since last contact from server.  Reconnecting..."));
}

}  // namespace
}  // namespace lmx

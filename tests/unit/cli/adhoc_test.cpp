// The ad-hoc client with a simulated daemon.
#include <sys/socket.h>

#include <csignal>
#include <future>

#include "cli/adhoc_client.h"
#include "platform/net/local_socket.h"
#include "support/unique_fd.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

/// Listens on the daemon's socket and serves one client.
class PlayedDaemon {
 public:
  PlayedDaemon() : path_(systemPath(kLocalSocket)) {
    ::unlink(path_.c_str());
    const auto address = localSocketAddress(path_);
    listener_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    EXPECT_EQ(::bind(listener_.get(), reinterpret_cast<const sockaddr*>(&*address), sizeof *address), 0);
    EXPECT_EQ(::listen(listener_.get(), 4), 0);
  }
  ~PlayedDaemon() { ::unlink(path_.c_str()); }
  PlayedDaemon(const PlayedDaemon&) = delete;
  PlayedDaemon& operator=(const PlayedDaemon&) = delete;

  void accept() { peer_.reset(::accept(listener_.get(), nullptr, nullptr)); }
  /// The next command; empty at the end of the connection.
  std::string receive() {
    std::string text(4096, '\0');
    const ssize_t size = ::recv(peer_.get(), text.data(), text.size(), 0);
    text.resize(size > 0 ? static_cast<std::size_t>(size) : 0);
    return text;
  }
  void reply(const std::string& text) {
    EXPECT_EQ(::send(peer_.get(), text.data(), text.size(), MSG_NOSIGNAL), static_cast<ssize_t>(text.size()));
  }
  void hangUp() { peer_.reset(); }

 private:
  std::string path_;
  UniqueFd listener_;
  UniqueFd peer_;
};

class AdHocMode : public AgentTest {
 protected:
  AdHocMode() { context_->options.adhoc.set(true); }
  ~AdHocMode() override { context_->options.adhoc.set(false); }

  /// Runs the client until it ends. @return what it printed
  std::string run() {
    ::testing::internal::CaptureStdout();
    EXPECT_EQ(AdHocClient(agent_).startupAdHoc(), 0);
    return ::testing::internal::GetCapturedStdout();
  }
};

TEST_F(AdHocMode, WithoutADaemonPrintsNothing) {
  context_->options.adhoc_request_type.set(1);
  EXPECT_EQ(run(), "");
  EXPECT_TRUE(log_.contains(kLogInfo, "lmxagentd (version 100) starting..."));
}

TEST_F(AdHocMode, AsksForTheStatusOnce) {
  PlayedDaemon daemon;
  context_->options.adhoc_request_type.set(1);
  auto conversation = std::async(std::launch::async, [&] {
    daemon.accept();
    EXPECT_EQ(daemon.receive(), "STATUS include_preview=true\n");
    daemon.reply("cmdStatus=0");
    EXPECT_EQ(daemon.receive(), "") << "nothing more, and the connection is closed";
  });
  EXPECT_EQ(run(), "Connected.\nsending: STATUS include_preview=true\n\nreceived: cmdStatus=0\n");
  conversation.get();
}

TEST_F(AdHocMode, CutsALongReply) {
  PlayedDaemon daemon;
  context_->options.adhoc_request_type.set(2);
  auto conversation = std::async(std::launch::async, [&] {
    daemon.accept();
    daemon.receive();
    daemon.reply(std::string(2000, 'x'));
    daemon.receive();
  });
  EXPECT_EQ(run(),
            "Connected.\nsending: TIMEDCMD command=TIMERLIST\n\nreceived: " + std::string(1023, 'x') + "\n");
  conversation.get();
}

TEST_F(AdHocMode, AHangUpPrintsAnEmptyReply) {
  PlayedDaemon daemon;
  context_->options.adhoc_request_type.set(1);
  auto conversation = std::async(std::launch::async, [&] {
    daemon.accept();
    daemon.receive();
    daemon.hangUp();
  });
  EXPECT_EQ(run(), "Connected.\nsending: STATUS include_preview=true\n\nreceived: <empty>\n");
  conversation.get();
}

class AdHocRecording : public AdHocMode, public ::testing::WithParamInterface<int> {};

TEST_P(AdHocRecording, LastsUntilASignal) {
  PlayedDaemon daemon;
  context_->options.submit_disabled.set(true);
  context_->options.adhoc_output_file.set("/tmp/a.mov");
  auto conversation = std::async(std::launch::async, [&] {
    daemon.accept();
    EXPECT_TRUE(daemon.receive().starts_with("START RecordingMetadata_RECORDING_UUID="));
    daemon.reply("cmdStatus=0");
    kill(getpid(), GetParam());
    EXPECT_EQ(daemon.receive(), "STOP \n");
    daemon.reply("cmdStatus=0,late=1");
    EXPECT_EQ(daemon.receive(), "");
  });
  const std::string printed = run();
  conversation.get();
  EXPECT_TRUE(printed.ends_with("received: cmdStatus=0\nsent STOP, received: cmdStatus=0,late=1\n"))
      << printed;
}

INSTANTIATE_TEST_SUITE_P(Signals, AdHocRecording, ::testing::Values(SIGINT, SIGTERM));

TEST_F(AdHocMode, AnInterruptWorksWhileTheDaemonIsBusy) {
  PlayedDaemon daemon;  // leaves the connection in its backlog, as when it serves another peer
  context_->options.submit_disabled.set(true);
  auto conversation = std::async(std::launch::async, [&] {
    daemon.accept();
    daemon.receive();
    kill(getpid(), SIGINT);
    EXPECT_EQ(daemon.receive(), "STOP \n") << "a START that was sent may still be carried out";
    daemon.reply("cmdStatus=0");
    daemon.receive();
  });
  const std::string printed = run();
  conversation.get();
  EXPECT_TRUE(printed.ends_with("received: <empty>\nsent STOP, received: cmdStatus=0\n")) << printed;
}

TEST_F(AdHocMode, AnUnknownRequestStartsARecordingButDoesNotWait) {
  PlayedDaemon daemon;
  context_->options.submit_disabled.set(true);
  context_->options.adhoc_request_type.set(9);
  auto conversation = std::async(std::launch::async, [&] {
    daemon.accept();
    EXPECT_TRUE(daemon.receive().starts_with("START "));
    daemon.reply("cmdStatus=0");
    EXPECT_EQ(daemon.receive(), "");
  });
  EXPECT_TRUE(run().ends_with("received: cmdStatus=0\n"));
  conversation.get();
}

class AdHocMarks : public AgentTest {};

TEST_F(AdHocMarks, PauseAndResumeSignalsMarkTheRecordingWithTheTimeShift) {
  const Controller made = start("R1");
  session_->recording_uuid.set("R1");
  context_->options.adhoc.set(true);
  context_->state.timeshift_seconds.set(30);
  const std::size_t before = made->marks().size();
  const double from = secondsSinceReferenceDate() - 30;
  agent_.signal(SIGUSR1);
  agent_.signal(SIGUSR2);
  const double to = secondsSinceReferenceDate() - 30;
  context_->options.adhoc.set(false);
  const auto marks = made->marks();
  ASSERT_EQ(marks.size(), before + 2);
  EXPECT_EQ(marks[before].operation, "setStop");
  EXPECT_EQ(marks[before + 1].operation, "setStart");
  for (std::size_t i = before; i < marks.size(); ++i) {
    EXPECT_EQ(marks[i].uuid, "R1");
    ASSERT_TRUE(marks[i].time);
    EXPECT_GE(*marks[i].time, from);
    EXPECT_LE(*marks[i].time, to);
  }
}

}  // namespace
}  // namespace lmx

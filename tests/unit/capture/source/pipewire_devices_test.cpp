// PipeWire's list where PipeWire is not well. The system tests have one that is.
#include "capture/source/pipewire_devices.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <thread>

#include "support/unique_fd.h"

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds kAllowance{2};  // for a busy machine

/// Something that listens where PipeWire's socket is looked for.
class OddServer {
 public:
  OddServer() : socket_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    std::string directory = std::filesystem::temp_directory_path() / "lmx-pipewire-XXXXXX";
    if (mkdtemp(directory.data()) == nullptr) std::abort();
    directory_ = directory;
    const std::string path = directory_ / "socket";
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.c_str(), path.size());
    if (bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        listen(socket_.get(), 8) != 0)
      std::abort();
    setenv("PIPEWIRE_REMOTE", path.c_str(), 1);
  }
  OddServer(const OddServer&) = delete;
  OddServer& operator=(const OddServer&) = delete;
  ~OddServer() {
    unsetenv("PIPEWIRE_REMOTE");
    std::filesystem::remove_all(directory_);
  }

  /// Takes the next connection, says something and hangs up.
  void answerOnce(const std::string& text) const {
    const UniqueFd connection(accept(socket_.get(), nullptr, nullptr));
    std::array<char, 64> heard{};
    (void)recv(connection.get(), heard.data(), heard.size(), 0);
    (void)send(connection.get(), text.data(), text.size(), MSG_NOSIGNAL);
  }

 private:
  UniqueFd socket_;
  std::filesystem::path directory_;
};

std::ptrdiff_t openFiles() {
  return std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                       std::filesystem::directory_iterator());
}

TEST(PipeWireDevices, AServerThatDoesNotAnswerHasNoneAndHoldsNothingUp) {
  const OddServer server;
  const auto begin = Clock::now();
  EXPECT_TRUE(PipeWireDevices().list().empty());
  const auto took = Clock::now() - begin;
  EXPECT_GE(took, PipeWireDevices::kPatience);
  EXPECT_LT(took, PipeWireDevices::kPatience + kAllowance);
}

TEST(PipeWireDevices, AServerThatHangsUpIsNotWaitedFor) {
  const OddServer server;
  std::thread peer([&] { server.answerOnce(""); });
  const auto begin = Clock::now();
  EXPECT_TRUE(PipeWireDevices().list().empty());
  EXPECT_LT(Clock::now() - begin, PipeWireDevices::kPatience);
  peer.join();
}

TEST(PipeWireDevices, NonsenseEndsInTimeAndLeavesNothing) {
  const OddServer server;
  std::ptrdiff_t files = 0;
  for (const char* word : {"HTTP/1.1 400 Bad Request\r\n\r\n", "\0", "\xFF\xFF\xFF\xFF"}) {
    std::string nonsense;
    while (nonsense.size() < 4096) nonsense.append(word, std::max<std::size_t>(1, std::strlen(word)));
    std::thread peer([&] { server.answerOnce(nonsense); });
    const auto begin = Clock::now();
    EXPECT_TRUE(PipeWireDevices().list().empty());
    EXPECT_LT(Clock::now() - begin, PipeWireDevices::kPatience + kAllowance);
    peer.join();
    if (files == 0) files = openFiles();  // the library keeps some once and for all
    EXPECT_EQ(openFiles(), files);
  }
}

TEST(PipeWireDevices, WithoutAServerThereAreNone) {
  setenv("PIPEWIRE_REMOTE", "/nowhere/at/all", 1);
  EXPECT_TRUE(PipeWireDevices().list().empty());
  unsetenv("PIPEWIRE_REMOTE");
}

}  // namespace
}  // namespace lmx

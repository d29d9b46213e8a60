// Message buses: without a bus, with an unresponsive one, and with a real private one.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <vector>

#include "platform/log.h"
#include "platform/notifications.h"
#include "platform/service_manager.h"
#include "support/unique_fd.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/temporary_directory.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;
using testing::LogCapture;
using testing::TemporaryDirectory;

/// Sets the buses' addresses for one test. Always use it: no test may reach a bus of the machine.
class Addresses {
 public:
  Addresses(const std::string& system, const std::string& session) {
    setenv("DBUS_SYSTEM_BUS_ADDRESS", system.c_str(), 1);
    setenv("DBUS_SESSION_BUS_ADDRESS", session.c_str(), 1);
  }
  explicit Addresses(const std::string& both) : Addresses(both, both) {}
};

/// A child process that ends with this object, and its standard output.
class Child {
 public:
  explicit Child(std::vector<std::string> argv) {
    int ends[2];
    EXPECT_EQ(pipe2(ends, O_CLOEXEC), 0);
    output_.reset(ends[0]);
    const UniqueFd writing(ends[1]);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, writing.get(), STDOUT_FILENO);
    // The bus reports missing permissions there, which don't concern this test.
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    std::vector<char*> words;
    for (std::string& word : argv) words.push_back(word.data());
    words.push_back(nullptr);
    if (posix_spawn(&pid_, words[0], &actions, nullptr, words.data(), environ) != 0) pid_ = -1;
    posix_spawn_file_actions_destroy(&actions);
  }
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;
  ~Child() {
    if (pid_ < 0) return;
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
  }

  [[nodiscard]] bool started() const { return pid_ > 0; }
  /// Reads until the output contains `text`. @return false after 20 s or at end of file
  bool waitFor(const std::string& text) {
    const auto deadline = Clock::now() + 20s;
    while (seen_.find(text) == std::string::npos) {
      pollfd polled{output_.get(), POLLIN, 0};
      const auto left =
          std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
      char buffer[1024];
      if (left <= 0 || poll(&polled, 1, static_cast<int>(left)) != 1) return false;
      const ssize_t size = read(output_.get(), buffer, sizeof buffer);
      if (size <= 0) return false;
      seen_.append(buffer, static_cast<std::size_t>(size));
    }
    return true;
  }
  [[nodiscard]] const std::string& seen() const { return seen_; }

 private:
  pid_t pid_ = -1;
  UniqueFd output_;
  std::string seen_;
};

/// A private message bus for a test.
class PrivateBus {
 public:
  PrivateBus()
      : address_("unix:path=" + directory_.file("bus")),
        daemon_({"/usr/bin/dbus-daemon", "--session", "--nofork", "--nosyslog", "--print-address",
                 "--address=" + address_}),
        ready_(daemon_.started() && daemon_.waitFor(directory_.file("bus"))) {}
  [[nodiscard]] bool ready() const { return ready_; }
  [[nodiscard]] const std::string& address() const { return address_; }

 private:
  TemporaryDirectory directory_;
  std::string address_;
  Child daemon_;
  bool ready_;
};

/// A socket that accepts connections and never answers.
class MuteBus {
 public:
  MuteBus() : fd_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, directory_.file("mute").c_str(), sizeof address.sun_path - 1);
    EXPECT_EQ(bind(fd_.get(), reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    EXPECT_EQ(listen(fd_.get(), 8), 0);
  }
  [[nodiscard]] std::string address() const { return "unix:path=" + directory_.file("mute"); }

 private:
  TemporaryDirectory directory_;
  UniqueFd fd_;
};

constexpr const char* kNowhere = "unix:path=/nonexistent/bus";

TEST(Notifications, WithoutABusThereIsOneDebugLineAtOnce) {
  const Addresses addresses(kNowhere);
  const LogCapture log;
  const auto begin = Clock::now();
  notify_post("com.zandor.lmxagentd.started");
  postDistributedNotification("com.zandor.lmxagentd.started");
  EXPECT_LT(Clock::now() - begin, 1s);
  const auto entries = log.entries();
  ASSERT_EQ(entries.size(), 2U);
  EXPECT_EQ(entries[0].level, kLogDebug);
  EXPECT_TRUE(entries[0].text.starts_with(
      "Notification com.zandor.lmxagentd.started was not sent on the system bus: "));
  EXPECT_TRUE(entries[1].text.starts_with(
      "Notification com.zandor.lmxagentd.started was not sent on the session bus: "));
}

TEST(Notifications, NoSessionBusIsStartedWhereThereIsNone) {
  const Addresses addresses(kNowhere);
  unsetenv("DBUS_SESSION_BUS_ADDRESS");
  const char* const runtime = getenv("XDG_RUNTIME_DIR");
  const std::string kept = runtime != nullptr ? runtime : "";
  unsetenv("XDG_RUNTIME_DIR");
  const LogCapture log;
  postDistributedNotification("x.stopped");
  EXPECT_TRUE(
      log.contains(kLogDebug, "Notification x.stopped was not sent on the session bus: there is none"));
  if (runtime != nullptr) setenv("XDG_RUNTIME_DIR", kept.c_str(), 1);
}

TEST(Notifications, InvalidNameIsExplained) {
  const Addresses addresses(kNowhere);
  const LogCapture log;
  notify_post("x.not a name");
  EXPECT_TRUE(log.contains(
      kLogDebug, "Notification x.not a name was not sent on the system bus: not a name for a signal"));
}

TEST(Notifications, UnresponsiveBusTimesOut) {
  const MuteBus bus;
  const Addresses addresses(bus.address());
  const LogCapture log;
  const auto begin = Clock::now();
  notify_post("x.started");
  EXPECT_GE(Clock::now() - begin, 1900ms);
  EXPECT_LT(Clock::now() - begin, 15s);
  EXPECT_TRUE(log.mentions("Notification x.started was not sent on the system bus: "));
}

TEST(Notifications, SignalsArriveOnTheirBus) {
  PrivateBus bus;
  if (!bus.ready()) GTEST_SKIP() << "no dbus-daemon here";
  Child monitor({"/usr/bin/dbus-monitor", "--address", bus.address(), "interface='com.zandor.lmxagentd'"});
  // It prints NameLost once it has become a monitor.
  if (!monitor.started() || !monitor.waitFor("NameLost")) GTEST_SKIP() << "no dbus-monitor here";
  const LogCapture log;
  const Addresses system(bus.address(), kNowhere);
  notify_post("com.zandor.lmxagentd.started");
  const Addresses session(kNowhere, bus.address());
  postDistributedNotification("com.zandor.lmxagentd.stopped");
  EXPECT_TRUE(monitor.waitFor("path=/com/zandor/lmxagentd; interface=com.zandor.lmxagentd; member=Started"));
  EXPECT_TRUE(monitor.waitFor("path=/com/zandor/lmxagentd; interface=com.zandor.lmxagentd; member=Stopped"));
  EXPECT_TRUE(log.entries().empty());
}

TEST(ServiceManager, WithoutABusNothingIsGrantedAndNothingWaits) {
  const Addresses addresses(kNowhere);
  const auto begin = Clock::now();
  const auto manager = newSystemServiceManager();
  EXPECT_FALSE(manager->authorize());
  EXPECT_FALSE(manager->isEnabled("com.zandor.lmxagentd"));
  EXPECT_TRUE(manager->disable("com.zandor.lmxagentd").has_value());
  EXPECT_LT(Clock::now() - begin, 1s);
}

TEST(ServiceManager, BusWithoutAServiceManagerGrantsNothing) {
  const PrivateBus bus;
  if (!bus.ready()) GTEST_SKIP() << "no dbus-daemon here";
  const Addresses addresses(bus.address(), kNowhere);
  const auto manager = newSystemServiceManager();
  EXPECT_FALSE(manager->authorize());
  EXPECT_FALSE(manager->isEnabled("com.zandor.lmxagentd"));
  EXPECT_TRUE(manager->disable("com.zandor.lmxagentd").has_value());
}

TEST(ServiceManager, ShellCommandGivesItsWaitStatus) {
  const auto manager = newSystemServiceManager();
  EXPECT_EQ(manager->runShellCommand("exit 0"), 0);
  EXPECT_EQ(WEXITSTATUS(manager->runShellCommand("exit 3")), 3);
}

}  // namespace
}  // namespace lmx

// Child processes, tested with real ones.
#include "platform/child_process.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/eventfd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <thread>

#include "support/unique_fd.h"
#include "tests/unit/doubles/temporary_directory.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;
using End = ChildResult::End;

ChildResult run(const std::vector<std::string>& argv, ChildOptions options = {}) {
  options.captureOutput = true;
  return systemChildRunner().run(argv, options);
}
ChildResult shell(const std::string& command, ChildOptions options = {}) {
  return run({"/bin/sh", "-c", command}, std::move(options));
}

TEST(ChildProcess, OutputAndStatusAreCollected) {
  const ChildResult result = shell("echo hello; exit 3");
  EXPECT_EQ(result.end, End::exited);
  EXPECT_EQ(result.status, 3);
  EXPECT_EQ(result.output, "hello\n");
  EXPECT_FALSE(result.succeeded());
  EXPECT_TRUE(shell("exit 0").succeeded());
}

TEST(ChildProcess, ArgumentsArePassedUnchanged) {
  const ChildResult result = run({"/usr/bin/printf", "%s|", "a b", "", "$HOME", "*", "'\"", "\xC3\xA4;"});
  EXPECT_EQ(result.output, "a b||$HOME|*|'\"|\xC3\xA4;|");
}

TEST(ChildProcess, SignalIsReported) {
  const ChildResult result = shell("kill -TERM $$");
  EXPECT_EQ(result.end, End::signalled);
  EXPECT_EQ(result.status, SIGTERM);
  EXPECT_FALSE(result.succeeded());
}

TEST(ChildProcess, ProgramThatCannotStartIsReported) {
  for (const bool captured : {false, true}) {
    ChildOptions options;
    options.captureOutput = captured;
    const ChildResult result = systemChildRunner().run({"/no/such/program"}, options);
    EXPECT_EQ(result.end, End::notStarted);
    EXPECT_EQ(result.status, ENOENT);
    EXPECT_FALSE(result.succeeded());
  }
  EXPECT_EQ(run({"/etc/passwd"}).status, EACCES);
  EXPECT_EQ(run({}).status, EINVAL);
}

TEST(ChildProcess, ChildThatHangsIsKilledAtTheLimit) {
  ChildOptions options;
  options.limit = 100ms;
  const auto begin = Clock::now();
  const ChildResult result = shell("echo begun; exec sleep 60", options);
  const auto taken = Clock::now() - begin;
  EXPECT_EQ(result.end, End::timedOut);
  EXPECT_EQ(result.output, "begun\n");
  EXPECT_FALSE(result.succeeded());
  EXPECT_GE(taken, 100ms);
  EXPECT_LT(taken, 20s);
}

TEST(ChildProcess, ChildWithinTheLimitIsNotKilled) {
  ChildOptions options;
  options.limit = 60s;
  EXPECT_TRUE(shell("exit 0", options).succeeded());
}

TEST(ChildProcess, ACancelledChildIsKilledAtOnce) {
  const UniqueFd cancel(eventfd(0, EFD_CLOEXEC));
  ChildOptions options;
  options.cancel = cancel.get();
  options.limit = 60s;
  ChildResult result;
  const auto begin = Clock::now();
  std::thread runner([&] { result = shell("echo begun; exec sleep 60", options); });
  eventfd_write(cancel.get(), 1);
  runner.join();
  EXPECT_EQ(result.end, End::cancelled);
  EXPECT_FALSE(result.succeeded());
  EXPECT_LT(Clock::now() - begin, 20s);
}

TEST(ChildProcess, AChildIsCancelledWhileItRuns) {
  int ends[2];
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  const UniqueFd cancel(ends[0]);
  UniqueFd keep(ends[1]);
  const testing::TemporaryDirectory folder;
  ChildOptions options;
  options.cancel = cancel.get();
  options.reportEvery = 20ms;
  options.stillRunning = [&](std::chrono::milliseconds) {
    if (std::filesystem::exists(folder.file("begun"))) keep.reset();
  };
  const ChildResult result = shell("echo output; touch " + folder.file("begun") + "; exec sleep 60", options);
  EXPECT_EQ(result.end, End::cancelled);
  EXPECT_EQ(result.output, "output\n");
}

TEST(ChildProcess, AfterACancellationNoChildIsStarted) {
  const UniqueFd cancel(eventfd(1, EFD_CLOEXEC));
  ChildOptions options;
  options.cancel = cancel.get();
  EXPECT_EQ(run({"/no/such/program"}, options).end, End::cancelled);
}

TEST(ChildProcess, LargeOutputDoesNotStopTheChild) {
  const ChildResult result = shell("head -c 3000000 /dev/zero");
  EXPECT_TRUE(result.succeeded());
  EXPECT_EQ(result.output.size(), 3000000U);
}

TEST(ChildProcess, OutputBeyondTheMaximumIsDropped) {
  ChildOptions options;
  options.maximumOutput = 1000;
  const ChildResult result = shell("head -c 3000000 /dev/zero", options);
  EXPECT_TRUE(result.succeeded());
  EXPECT_EQ(result.output.size(), 1000U);
}

TEST(ChildProcess, ChildThatClosesItsOutputEarlyIsAwaited) {
  const ChildResult result = shell("echo x; exec >&-; sleep 0.1; exit 5");
  EXPECT_EQ(result.status, 5);
  EXPECT_EQ(result.output, "x\n");
}

TEST(ChildProcess, GrandchildHoldingTheOutputIsNotAwaited) {
  const auto begin = Clock::now();
  const ChildResult result = shell("sleep 8 2>/dev/null & echo done");
  EXPECT_TRUE(result.succeeded());
  EXPECT_EQ(result.output, "done\n");
  EXPECT_LT(Clock::now() - begin, 6s);
}

TEST(ChildProcess, ChildHasDefaultSignalMaskAndDispositions) {
  const auto before = std::signal(SIGUSR1, SIG_IGN);
  sigset_t blocked;
  sigset_t old;
  sigemptyset(&blocked);
  sigaddset(&blocked, SIGUSR2);
  pthread_sigmask(SIG_BLOCK, &blocked, &old);
  const ChildResult result = run({"/bin/grep", "-E", "^Sig(Blk|Ign):", "/proc/self/status"});
  pthread_sigmask(SIG_SETMASK, &old, nullptr);
  std::signal(SIGUSR1, before);
  // The C library reserves two signals and ignores them in every child that it starts.
  constexpr unsigned long long kLibrarySignals = 3ULL << 31;
  unsigned long long mask_of_blocked = 1;
  unsigned long long mask_of_ignored = 1;
  ASSERT_EQ(
      std::sscanf(result.output.c_str(), "SigBlk: %llx SigIgn: %llx", &mask_of_blocked, &mask_of_ignored), 2);
  EXPECT_EQ(mask_of_blocked, 0U);
  EXPECT_EQ(mask_of_ignored & ~kLibrarySignals, 0U);
}

TEST(ChildProcess, DescriptorsAreNotInherited) {
  // A descriptor without close-on-exec.
  const UniqueFd forgotten(fcntl(STDIN_FILENO, F_DUPFD, 20));
  ASSERT_TRUE(forgotten.valid());
  const ChildResult result = run({"/bin/ls", "/proc/self/fd"});
  EXPECT_EQ(result.output, "0\n1\n2\n3\n");  // 3 is ls's own descriptor for the directory
}

TEST(ChildProcess, LongRunIsReported) {
  ChildOptions options;
  options.reportEvery = 20ms;
  std::vector<std::chrono::milliseconds> reports;
  options.stillRunning = [&](std::chrono::milliseconds elapsed) { reports.push_back(elapsed); };
  EXPECT_TRUE(shell("sleep 0.3", options).succeeded());
  ASSERT_GE(reports.size(), 2U);
  EXPECT_GE(reports[0], 20ms);
  EXPECT_GE(reports[1], 40ms);
}

TEST(ChildProcess, IgnoredSigchldIsNotReportedAsSuccess) {
  const auto before = std::signal(SIGCHLD, SIG_IGN);
  const ChildResult result = shell("exit 1");
  std::signal(SIGCHLD, before);
  EXPECT_FALSE(result.succeeded());
}

TEST(ChildProcess, ThreadsRunChildrenAtTheSameTime) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([t] {
      for (int i = 0; i < 5; ++i) {
        const ChildResult result = shell("echo " + std::to_string(t) + "; exit " + std::to_string(i));
        EXPECT_EQ(result.output, std::to_string(t) + "\n");
        EXPECT_EQ(result.status, i);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
}  // namespace lmx

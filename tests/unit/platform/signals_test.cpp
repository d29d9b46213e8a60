// Signals as run-loop work.
#include "platform/signals.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <csignal>
#include <memory>
#include <thread>

namespace lmx {
namespace {

using namespace std::chrono_literals;
using Turn = RunLoop::Turn;

/// Runs turns until nothing is left to do.
void runAll(RunLoop& loop) {
  while (loop.run(0ms) == Turn::handledSource) {
  }
}

TEST(SignalSource, SignalBecomesAnActionOfTheLoop) {
  RunLoop loop;
  std::vector<int> got;
  const SignalSource source(loop, {SIGUSR1, SIGUSR2}, [&](int number) { got.push_back(number); });
  raise(SIGUSR2);
  EXPECT_TRUE(got.empty());
  runAll(loop);
  EXPECT_EQ(got, std::vector<int>{SIGUSR2});
}

TEST(SignalSource, KeepsTheOrderOfSignals) {
  RunLoop loop;
  std::vector<int> got;
  const SignalSource source(loop, {SIGUSR1, SIGUSR2, SIGHUP}, [&](int number) { got.push_back(number); });
  const std::vector<int> sent{SIGHUP, SIGUSR1, SIGUSR2, SIGUSR1};
  for (const int number : sent) raise(number);
  runAll(loop);
  EXPECT_EQ(got, sent);
}

TEST(SignalSource, WakesATurn) {
  RunLoop loop;
  bool got = false;
  const SignalSource source(loop, {SIGUSR1}, [&](int) { got = true; });
  std::thread sender([] { kill(getpid(), SIGUSR1); });
  while (!got) loop.run(1h);
  sender.join();
}

TEST(SignalSource, NestedTurnDeliversTheNextSignal) {
  RunLoop loop;
  std::vector<int> got;
  const SignalSource source(loop, {SIGUSR1, SIGUSR2}, [&](int number) {
    got.push_back(number);
    if (number == SIGUSR1) {
      raise(SIGUSR2);
      runAll(loop);
      EXPECT_EQ(got.back(), SIGUSR2);
    }
  });
  raise(SIGUSR1);
  runAll(loop);
  EXPECT_EQ(got, (std::vector<int>{SIGUSR1, SIGUSR2}));
}

TEST(SignalSource, HandlerBlocksEverythingAndRestartsCalls) {
  RunLoop loop;
  const SignalSource source(loop, {SIGUSR1}, [](int) {});
  struct sigaction installed {};
  sigaction(SIGUSR1, nullptr, &installed);
  EXPECT_NE(installed.sa_flags & SA_RESTART, 0);
  for (const int number : {SIGTERM, SIGHUP, SIGUSR2, SIGINT})
    EXPECT_EQ(sigismember(&installed.sa_mask, number), 1);
}

TEST(SignalSource, HandlerKeepsErrno) {
  RunLoop loop;
  const SignalSource source(loop, {SIGUSR1}, [](int) {});
  // More than the pipe holds, so that the handler's writes fail.
  for (int i = 0; i < 70000; ++i) {
    errno = EDOM;
    raise(SIGUSR1);
    ASSERT_EQ(errno, EDOM);
  }
}

TEST(SignalSource, DestructionRestoresTheOldHandlers) {
  const auto before = std::signal(SIGUSR1, SIG_IGN);
  {
    RunLoop loop;
    const SignalSource source(loop, {SIGUSR1}, [](int) {});
  }
  raise(SIGUSR1);
  EXPECT_EQ(std::signal(SIGUSR1, before), SIG_IGN);
}

TEST(SignalSource, SignalsOfAnEarlierSourceAreForgotten) {
  RunLoop loop;
  auto first = std::make_unique<SignalSource>(loop, std::vector<int>{SIGUSR1}, [](int) {});
  raise(SIGUSR1);
  first.reset();
  bool got = false;
  const SignalSource second(loop, {SIGUSR1}, [&](int) { got = true; });
  runAll(loop);
  EXPECT_FALSE(got);
}

TEST(SignalSource, ActionMayDestroyItsSource) {
  RunLoop loop;
  int got = 0;
  std::unique_ptr<SignalSource> source;
  source = std::make_unique<SignalSource>(loop, std::vector<int>{SIGUSR1},
                                          [&source, &got, held = std::make_shared<int>(1)](int) {
                                            source.reset();
                                            got += *held;
                                          });
  raise(SIGUSR1);
  runAll(loop);
  EXPECT_EQ(got, 1);
}

}  // namespace
}  // namespace lmx

// Starts child processes and waits for them.
#include "platform/child_process.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <memory>
#include <optional>

#include "support/unique_fd.h"

extern char** environ;

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

class SpawnSettings {
 public:
  explicit SpawnSettings(int outputEnd) {
    posix_spawn_file_actions_init(&actions_);
    posix_spawnattr_init(&attributes_);
    if (outputEnd >= 0) posix_spawn_file_actions_adddup2(&actions_, outputEnd, STDOUT_FILENO);
    posix_spawn_file_actions_addclosefrom_np(&actions_, 3);
    sigset_t none;
    sigset_t all;
    sigemptyset(&none);
    sigfillset(&all);
    posix_spawnattr_setsigmask(&attributes_, &none);
    posix_spawnattr_setsigdefault(&attributes_, &all);
    posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  }
  SpawnSettings(const SpawnSettings&) = delete;
  SpawnSettings& operator=(const SpawnSettings&) = delete;
  ~SpawnSettings() {
    posix_spawn_file_actions_destroy(&actions_);
    posix_spawnattr_destroy(&attributes_);
  }
  int spawn(pid_t* child, const std::vector<std::string>& argv) const {
    if (argv.empty()) return EINVAL;
    std::vector<char*> words;
    for (const std::string& word : argv)
      words.push_back(const_cast<char*>(word.c_str()));  // NOLINT: the type exec takes
    words.push_back(nullptr);
    return posix_spawn(child, words[0], &actions_, &attributes_, words.data(), environ);
  }

 private:
  posix_spawn_file_actions_t actions_;
  posix_spawnattr_t attributes_;
};

/// Reads the output available now. @return false at end of file
bool readOutput(int fd, std::string& output, std::size_t limit) {
  char buffer[16384];
  const ssize_t n = read(fd, buffer, sizeof buffer);
  if (n < 0) return errno == EINTR || errno == EAGAIN;
  if (n == 0) return false;
  output.append(buffer, std::min(static_cast<std::size_t>(n), limit - std::min(limit, output.size())));
  return true;
}

bool readable(int fd) {
  pollfd polled{fd, POLLIN, 0};
  return fd >= 0 && poll(&polled, 1, 0) > 0;
}

/// Waits for a child to end and reads its output in the meantime.
class ChildWait {
 public:
  ChildWait(pid_t child, UniqueFd output, const ChildOptions& options)
      : child_(child),
        output_(std::move(output)),
        options_(options),
        handle_(static_cast<int>(syscall(SYS_pidfd_open, child, 0))) {}

  ChildResult run() {
    ChildResult result;
    while (!hasEnded()) {
      const milliseconds left = nextWait();
      if (!killed_) killIfDue();
      waitOnce(left, result.output);
      reportIfDue();
    }
    drain(result.output);
    return collect(std::move(result));
  }

 private:
  /// Whether the child's status can be collected. Without a pidfd (old kernel, no free descriptor) waitOnce
  /// sleeps briefly and this polls.
  bool hasEnded() {
    if (handle_.valid() || ended_) return ended_;
    siginfo_t info{};
    const int asked = waitid(P_PID, static_cast<id_t>(child_), &info, WEXITED | WNOHANG | WNOWAIT);
    ended_ = asked != 0 ? errno != EINTR : info.si_pid == child_;
    return ended_;
  }

  void killIfDue() {
    if (readable(options_.cancel)) {
      killed_ = ChildResult::End::cancelled;
    } else if (limitReached()) {
      killed_ = ChildResult::End::timedOut;
    }
    if (killed_) kill(child_, SIGKILL);
  }

  ChildResult collect(ChildResult result) const {
    int status = 0;
    pid_t reaped = 0;
    do {
      reaped = waitpid(child_, &status, 0);
    } while (reaped < 0 && errno == EINTR);
    if (reaped < 0) {
      result.status = errno;  // the status was reaped elsewhere (SIGCHLD ignored): never report success
      return result;
    }
    // A child that exited just before our SIGKILL finished its work and counts as such.
    const bool by_us = killed_ && WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL;
    result.end = by_us                 ? *killed_
                 : WIFSIGNALED(status) ? ChildResult::End::signalled
                                       : ChildResult::End::exited;
    result.status = WIFSIGNALED(status) ? WTERMSIG(status) : WEXITSTATUS(status);
    return result;
  }

  [[nodiscard]] bool limitReached() const {
    return options_.limit && Clock::now() - started_ >= *options_.limit;
  }

  [[nodiscard]] milliseconds nextWait() const {
    const auto elapsed = std::chrono::duration_cast<milliseconds>(Clock::now() - started_);
    milliseconds wait{std::chrono::hours(1)};
    if (options_.limit) wait = std::min(wait, std::max(milliseconds(0), *options_.limit - elapsed));
    if (options_.reportEvery.count() > 0) {
      wait = std::min(wait, std::max(milliseconds(0), options_.reportEvery * (reports_ + 1) - elapsed));
    }
    return wait;
  }

  void waitOnce(milliseconds wait, std::string& output) {
    if (killed_) wait = std::chrono::hours(1);
    if (!handle_.valid()) wait = std::min(wait, milliseconds(20));
    // A cancellation stays readable: once the child is killed for it, it would keep this from sleeping.
    const int cancel = killed_ ? -1 : options_.cancel;
    pollfd polled[3] = {{handle_.get(), POLLIN, 0}, {output_.get(), POLLIN, 0}, {cancel, POLLIN, 0}};
    const int ready = poll(polled, 3, static_cast<int>(wait.count()) + 1);
    if (ready <= 0) return;
    if (polled[1].revents != 0 && !readOutput(output_.get(), output, options_.maximumOutput)) output_.reset();
    if (polled[0].revents != 0) ended_ = true;
  }

  void reportIfDue() {
    if (ended_ || options_.reportEvery.count() <= 0) return;
    const auto elapsed = std::chrono::duration_cast<milliseconds>(Clock::now() - started_);
    if (elapsed < options_.reportEvery * (reports_ + 1)) return;
    ++reports_;
    if (options_.stillRunning) options_.stillRunning(elapsed);
  }

  /// Reads the remaining output. A grandchild may keep the pipe open, so this waits at most 100 ms.
  void drain(std::string& output) {
    const auto deadline = Clock::now() + milliseconds(100);
    while (output_.valid()) {
      const auto left = std::chrono::ceil<milliseconds>(deadline - Clock::now()).count();
      pollfd polled{output_.get(), POLLIN, 0};
      if (left <= 0 || poll(&polled, 1, static_cast<int>(left)) <= 0 ||
          !readOutput(output_.get(), output, options_.maximumOutput))
        return;
    }
  }

  const pid_t child_;
  UniqueFd output_;
  const ChildOptions& options_;
  UniqueFd handle_;
  const Clock::time_point started_ = Clock::now();
  std::int64_t reports_ = 0;
  std::optional<ChildResult::End> killed_;  ///< why we have killed it
  bool ended_ = false;
};

class SystemChildRunner : public ChildRunner {
 public:
  ChildResult run(const std::vector<std::string>& argv, const ChildOptions& options) override {
    ChildResult result;
    if (readable(options.cancel)) {
      result.end = ChildResult::End::cancelled;
      return result;
    }
    UniqueFd reading;
    UniqueFd writing;
    if (options.captureOutput) {
      int ends[2];
      if (pipe2(ends, O_CLOEXEC) != 0) {
        result.status = errno;
        return result;
      }
      reading.reset(ends[0]);
      writing.reset(ends[1]);
    }
    pid_t child = 0;
    result.status = SpawnSettings(writing.get()).spawn(&child, argv);
    if (result.status != 0) return result;
    writing.reset();
    return ChildWait(child, std::move(reading), options).run();
  }
};

}  // namespace

ChildRunner& systemChildRunner() {
  // Never destroyed: threads that outlive main use it.
  static SystemChildRunner& runner = *std::make_unique<SystemChildRunner>().release();
  return runner;
}

}  // namespace lmx

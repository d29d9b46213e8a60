// Messages on their way to the log daemon and to standard error.
#include "platform/log.h"

#include <poll.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <exception>
#include <memory>
#include <mutex>
#include <string_view>

#include "platform/log_socket.h"
#include "platform/log_text.h"
#include "support/redacted.h"

namespace lmx {

struct LogContext {
  LogContext(std::string name, int syslogFacility) : program(std::move(name)), facility(syslogFacility) {}

  const std::string program;
  const int facility;
  std::mutex mutex;  ///< guards what follows, and keeps messages in order
  LogSocket socket;
};

namespace {

constexpr const char* kLevelNames[] = {"emergency", "alert",  "critical", "error",
                                       "warning",   "notice", "info",     "debug"};

class ErrnoKeeper {
 public:
  ErrnoKeeper() = default;
  ErrnoKeeper(const ErrnoKeeper&) = delete;
  ErrnoKeeper& operator=(const ErrnoKeeper&) = delete;
  ~ErrnoKeeper() { errno = saved_; }

 private:
  const int saved_ = errno;
};

struct TestSink {
  std::atomic<bool> active{false};  ///< lets ordinary messages skip the lock
  std::mutex mutex;                 ///< guards the members below and every call of the sink
  LogSink sink = nullptr;
  void* user = nullptr;
};

TestSink& testSink() {
  static TestSink& sink = *std::make_unique<TestSink>().release();
  return sink;
}

/// Never destroyed: threads log until the process ends.
LogContext& defaultContext() {
  static LogContext& context = *std::make_unique<LogContext>("lmxagentd", LOG_DAEMON).release();
  return context;
}

__attribute__((format(printf, 1, 0))) std::string formatMessage(const char* format, va_list arguments) {
  char buffer[kMessageLimit + 1];
  const int length = vsnprintf(buffer, sizeof buffer, format, arguments);
  if (length < 0) return std::string("message that can't be formatted: ") + format;
  return {buffer, std::min(static_cast<std::size_t>(length), kMessageLimit)};
}

struct Mirror {
  bool always = false;
  int level = kLogDebug;
};

Mirror readMirror() {
  Mirror mirror;
  const char* target = std::getenv("LMXAGENTD_LOG");
  mirror.always = target != nullptr && std::strcmp(target, "stderr") == 0;
  const char* level = std::getenv("LMXAGENTD_LOG_LEVEL");
  if (level != nullptr && *level >= '0' && *level <= '9') mirror.level = std::atoi(level);
  return mirror;
}

/// Whether a write to standard error would neither block nor raise SIGPIPE.
bool canWriteToStandardError() {
  pollfd fd{STDERR_FILENO, POLLOUT, 0};
  return poll(&fd, 1, 0) == 1 && (fd.revents & (POLLERR | POLLHUP | POLLNVAL)) == 0;
}

void mirrorToStandardError(const LogContext& context, int level, std::string_view text) {
  static const Mirror mirror = readMirror();
  // Checked each time: the descriptor may since have been reused for something that isn't ours to write to.
  if (level > mirror.level || !(mirror.always || isatty(STDERR_FILENO) == 1)) return;
  if (!canWriteToStandardError()) return;
  std::string line = context.program + '[' + std::to_string(getpid()) + "] " + kLevelNames[level] + ": ";
  line += text;
  if (line.back() != '\n') line += '\n';
  [[maybe_unused]] const ssize_t written = write(STDERR_FILENO, line.data(), line.size());
}

bool giveToTestSink(int level, const std::string& text) {
  TestSink& sink = testSink();
  if (!sink.active.load(std::memory_order_acquire)) return false;
  const std::lock_guard lock(sink.mutex);
  if (sink.sink == nullptr) return false;
  sink.sink(sink.user, level, text);
  return true;
}

void writeMessage(LogContext& context, int level, const std::string& text) {
  if (giveToTestSink(level, text)) return;
  const auto datagram = [&context](int messageLevel, std::string_view message) {
    return logDatagram(context.facility | messageLevel, std::time(nullptr), context.program, getpid(),
                       message);
  };
  const std::lock_guard lock(context.mutex);
  context.socket.send(datagram(level, text),
                      [&](const std::string& notice) { return datagram(kLogWarning, notice); });
  mirrorToStandardError(context, level, text);
}

}  // namespace

LMPLogContext LMPLogCreateContext(const char* program, const char* facility) {
  if (program == nullptr || facility == nullptr) return nullptr;
  try {
    auto context = std::make_unique<LogContext>(program, facilityNamed(facility));
    context->socket.connect();
    return context.release();
  } catch (const std::exception&) {
    return nullptr;
  }
}

void LMPLogDestroyContext(LMPLogContext context) { const std::unique_ptr<LogContext> owner(context); }

void LMPLogMessage(LMPLogContext context, int level, const char* format, ...) {
  const ErrnoKeeper errno_keeper;
  LogContext& target = context != nullptr ? *context : defaultContext();
  va_list arguments;
  va_start(arguments, format);
  try {
    // Here and not by the callers: error texts of libraries quote addresses too. Before the escapes, which
    // would join an address to the next line.
    const std::string text = escapeControls(redacted(formatMessage(format, arguments)));
    writeMessage(target, std::clamp(level, 0, static_cast<int>(kLogDebug)), text);
  } catch (const std::exception&) {
    // Out of memory: the message can't be reported anywhere.
  }
  va_end(arguments);
}

void setLogSinkForTesting(LogSink sink, void* user) {
  TestSink& target = testSink();
  const std::lock_guard lock(target.mutex);
  target.sink = sink;
  target.user = user;
  target.active.store(sink != nullptr, std::memory_order_release);
}

}  // namespace lmx

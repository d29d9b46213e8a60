// Formats messages, escapes control characters and sends them to the system log without blocking.
#include "platform/log.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <exception>
#include <memory>
#include <mutex>
#include <string_view>

#include "platform/paths.h"
#include "support/unique_fd.h"

namespace lmx {

struct LogContext {
  LogContext(std::string name, int syslogFacility) : program(std::move(name)), facility(syslogFacility) {}

  const std::string program;
  const int facility;
  std::mutex mutex;  ///< guards the members below and keeps messages in order
  UniqueFd socket;
  unsigned long lost = 0;
  std::chrono::steady_clock::time_point next_attempt{};
};

namespace {

constexpr std::size_t kMessageLimit = 8U << 10;
constexpr std::chrono::seconds kReconnectInterval{1};
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

int facilityNamed(std::string_view name) {
  struct Entry {
    std::string_view name;
    int facility;
  };
  static constexpr Entry kFacilities[] = {
      {"com.zandor.lumex", LOG_DAEMON},
      {"auth", LOG_AUTH},
      {"authpriv", LOG_AUTHPRIV},
      {"cron", LOG_CRON},
      {"daemon", LOG_DAEMON},
      {"ftp", LOG_FTP},
      {"kern", LOG_KERN},
      {"lpr", LOG_LPR},
      {"mail", LOG_MAIL},
      {"news", LOG_NEWS},
      {"syslog", LOG_SYSLOG},
      {"user", LOG_USER},
      {"uucp", LOG_UUCP},
      {"local0", LOG_LOCAL0},
      {"local1", LOG_LOCAL1},
      {"local2", LOG_LOCAL2},
      {"local3", LOG_LOCAL3},
      {"local4", LOG_LOCAL4},
      {"local5", LOG_LOCAL5},
      {"local6", LOG_LOCAL6},
      {"local7", LOG_LOCAL7},
  };
  for (const Entry& entry : kFacilities) {
    if (entry.name == name) return entry.facility;
  }
  return LOG_USER;
}

__attribute__((format(printf, 1, 0))) std::string formatMessage(const char* format, va_list arguments) {
  char buffer[kMessageLimit + 1];
  const int length = vsnprintf(buffer, sizeof buffer, format, arguments);
  if (length < 0) return std::string("message that can't be formatted: ") + format;
  return {buffer, std::min(static_cast<std::size_t>(length), kMessageLimit)};
}

void appendEscaped(std::string& out, unsigned char byte) {
  switch (byte) {
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      break;
  }
  char text[5];
  snprintf(text, sizeof text, "\\x%02X", static_cast<unsigned>(byte));
  out += text;
}

/// Escapes control characters, so that bytes from a peer can forge neither log lines nor terminal commands.
/// This includes the C1 controls (encoded as C2 80 … C2 9F). Keeps one newline at the end.
std::string escapeControls(std::string_view text) {
  const bool newline = !text.empty() && text.back() == '\n';
  if (newline) text.remove_suffix(1);
  std::string out;
  out.reserve(text.size() + 1);
  for (std::size_t i = 0; i < text.size() && out.size() < kMessageLimit; ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    const auto next = static_cast<unsigned char>(i + 1 < text.size() ? text[i + 1] : 0);
    if (byte == 0xC2 && next >= 0x80 && next < 0xA0) {
      appendEscaped(out, byte);
      appendEscaped(out, next);
      ++i;
    } else if (byte < 0x20 || byte == 0x7F) {
      appendEscaped(out, byte);
    } else {
      out += text[i];
    }
  }
  const std::size_t limit = kMessageLimit - (newline ? 1 : 0);
  if (out.size() > limit) {
    std::size_t end = limit;
    while (end > 0 && (static_cast<unsigned char>(out[end]) & 0xC0) == 0x80) --end;  // whole characters
    out.resize(end);
  }
  if (newline) out += '\n';
  return out;
}

std::string datagramOf(const LogContext& context, int level, std::string_view text) {
  static constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  char head[64];
  snprintf(head, sizeof head, "<%d>%s %2d %02d:%02d:%02d ", context.facility | level, kMonths[local.tm_mon],
           local.tm_mday, local.tm_hour, local.tm_min, local.tm_sec);
  std::string datagram = head;
  datagram += context.program;
  datagram += '[' + std::to_string(getpid()) + "]: ";
  datagram += text;
  return datagram;
}

UniqueFd connectToLog() {
  const std::string path = systemPath(kLogSocket);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) return {};
  std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
  UniqueFd fd(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!fd.valid()) return {};
  if (connect(fd.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) return {};
  return fd;
}

/// Connects unless the last failure was less than a second ago. Call with the context's lock held.
bool ensureConnected(LogContext& context) {
  if (context.socket.valid()) return true;
  const auto now = std::chrono::steady_clock::now();
  if (now < context.next_attempt) return false;
  context.socket = connectToLog();
  if (!context.socket.valid()) context.next_attempt = now + kReconnectInterval;
  return context.socket.valid();
}

enum class Sent { yes, full, gone };

Sent sendOnce(int socket, std::string_view datagram) {
  for (;;) {
    if (send(socket, datagram.data(), datagram.size(), MSG_DONTWAIT | MSG_NOSIGNAL) >= 0) return Sent::yes;
    switch (errno) {
      case EINTR:
        continue;
      case EAGAIN:
      case ENOBUFS:
      case ENOMEM:
      case EMSGSIZE:
        return Sent::full;
      default:
        return Sent::gone;
    }
  }
}

/// Sends a message; reconnects once, in case the log daemon was restarted. Call with the context's lock held.
bool deliver(LogContext& context, std::string_view datagram) {
  for (int attempt = 0; attempt < 2; ++attempt) {
    if (!ensureConnected(context)) return false;
    switch (sendOnce(context.socket.get(), datagram)) {
      case Sent::yes:
        return true;
      case Sent::full:
        return false;
      case Sent::gone:
        context.socket.reset();
        break;
    }
  }
  context.next_attempt = std::chrono::steady_clock::now() + kReconnectInterval;
  return false;
}

void sendToLog(LogContext& context, int level, std::string_view text) {
  if (context.lost > 0) {
    const std::string notice = std::to_string(context.lost) + " messages lost";
    if (deliver(context, datagramOf(context, kLogWarning, notice))) context.lost = 0;
  }
  // While earlier losses are unreported, sending this message would hide the gap.
  if (context.lost > 0 || !deliver(context, datagramOf(context, level, text))) ++context.lost;
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
  const std::lock_guard lock(context.mutex);
  sendToLog(context, level, text);
  mirrorToStandardError(context, level, text);
}

}  // namespace

LMPLogContext LMPLogCreateContext(const char* program, const char* facility) {
  if (program == nullptr || facility == nullptr) return nullptr;
  try {
    auto context = std::make_unique<LogContext>(program, facilityNamed(facility));
    context->socket = connectToLog();
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
    const std::string text = escapeControls(formatMessage(format, arguments));
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

// The log transport.
#include "platform/log.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <mutex>
#include <new>

#include "platform/paths.h"
#include "support/unique_fd.h"

namespace lmx {

namespace {

using Clock = std::chrono::steady_clock;
constexpr std::size_t kMessageLimit = 8192;
constexpr std::chrono::seconds kReconnectInterval{1};

int facilityCode(const std::string& name) {
  static constexpr std::array<std::pair<const char*, int>, 6> kNames{{{"com.zandor.lumex", LOG_DAEMON},
                                                                      {"daemon", LOG_DAEMON},
                                                                      {"user", LOG_USER},
                                                                      {"auth", LOG_AUTH},
                                                                      {"local0", LOG_LOCAL0},
                                                                      {"syslog", LOG_SYSLOG}}};
  for (const auto& [text, code] : kNames) {
    if (name == text) return code;
  }
  return LOG_USER;
}

const char* levelName(int level) {
  static constexpr const char* kLevels[] = {"emergency", "alert",  "critical", "error",
                                            "warning",   "notice", "info",     "debug"};
  return kLevels[level < 0 || level > 7 ? 7 : level];
}

/// A peer's bytes must not forge a log line: what controls a terminal or ends a line is shown instead.
std::string escapedText(const char* text, std::size_t length) {
  std::string out;
  out.reserve(length + 8);
  for (std::size_t i = 0; i < length; ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    const bool trailingNewline = c == '\n' && i + 1 == length;
    if ((c >= ' ' && c != 0x7F) || trailingNewline) {
      out += static_cast<char>(c);
    } else {
      char escape[5];
      std::snprintf(escape, sizeof escape, "\\x%02X", c);
      out += c == '\n' ? "\\n" : c == '\r' ? "\\r" : c == '\t' ? "\\t" : escape;
    }
  }
  return out;
}

struct StandardError {
  bool enabled = false;
  int level = kLogDebug;
};

const StandardError& standardError() {
  static const StandardError settings = [] {
    StandardError s;
    const char* target = std::getenv("LMXAGENTD_LOG");
    s.enabled = (target != nullptr && std::strcmp(target, "stderr") == 0) || isatty(STDERR_FILENO) == 1;
    if (const char* level = std::getenv("LMXAGENTD_LOG_LEVEL")) s.level = std::atoi(level);
    return s;
  }();
  return settings;
}

struct Sink {
  std::mutex mutex;
  LogSink function = nullptr;  // guarded by mutex
  void* user = nullptr;        // guarded by mutex
};
Sink& sink() {
  static auto* instance = new Sink;
  return *instance;
}

bool givenToSink(int level, const std::string& text) {
  const std::lock_guard lock(sink().mutex);
  if (sink().function == nullptr) return false;
  sink().function(sink().user, level, text);
  return true;
}

}  // namespace

struct LogContext {
  std::string program;
  int facility = LOG_DAEMON;

  void write(int level, const std::string& text) {
    const std::lock_guard lock(mutex_);
    if (lost_ > 0 && send(kLogWarning, std::to_string(lost_) + " messages lost")) lost_ = 0;
    if (lost_ > 0 || !send(level, text)) ++lost_;
  }

 private:
  bool send(int level, const std::string& text) {
    if (!socket_.valid() && !open()) return false;
    char stamp[32];
    const time_t now = std::time(nullptr);
    tm local{};
    localtime_r(&now, &local);
    // Month names in English whatever the locale: the form every log daemon reads.
    static constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                              "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
    std::snprintf(stamp, sizeof stamp, "%s %2d %02d:%02d:%02d", kMonths[local.tm_mon % 12], local.tm_mday,
                  local.tm_hour, local.tm_min, local.tm_sec);
    const std::string datagram = "<" + std::to_string(facility | level) + ">" + stamp + " " + program + "[" +
                                 std::to_string(getpid()) + "]: " + text;
    if (sendDatagram(datagram)) return true;
    if (errno != ECONNREFUSED && errno != ENOTCONN && errno != ENOENT && errno != ECONNRESET) return false;
    socket_.reset();  // the log daemon was restarted
    last_attempt_ = {};
    return open() && sendDatagram(datagram);
  }

  bool sendDatagram(const std::string& datagram) {
    return ::send(socket_.get(), datagram.data(), datagram.size(), MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
  }

  bool open() {
    const auto now = Clock::now();
    if (now - last_attempt_ < kReconnectInterval) return false;
    last_attempt_ = now;
    UniqueFd fd(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string path = systemPath(kLogSocket);
    if (!fd.valid() || path.size() >= sizeof address.sun_path) return false;
    std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
    if (connect(fd.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) return false;
    socket_ = std::move(fd);
    return true;
  }

  std::mutex mutex_;
  UniqueFd socket_;                   // guarded by mutex_
  std::uint64_t lost_ = 0;            // guarded by mutex_
  Clock::time_point last_attempt_{};  // guarded by mutex_
};

namespace {

LogContext& defaultContext() {
  static auto* context = [] {  // never destroyed: threads log until the process ends
    auto* made = new LogContext;
    made->program = "lmxagentd";
    return made;
  }();
  return *context;
}

}  // namespace

LMPLogContext LMPLogCreateContext(const char* program, const char* facility) {
  if (program == nullptr || facility == nullptr) return nullptr;
  auto* context = new (std::nothrow) LogContext;
  if (context == nullptr) return nullptr;
  context->program = program;
  context->facility = facilityCode(facility);
  return context;
}

void LMPLogDestroyContext(LMPLogContext context) { delete context; }

void LMPLogMessage(LMPLogContext context, int level, const char* format, ...) {
  const int saved = errno;
  char buffer[kMessageLimit];
  va_list arguments;
  va_start(arguments, format);
  const int length = std::vsnprintf(buffer, sizeof buffer, format, arguments);
  va_end(arguments);
  if (length >= 0) {
    const std::string text =
        escapedText(buffer, std::min<std::size_t>(static_cast<std::size_t>(length), kMessageLimit - 1));
    if (!givenToSink(level, text)) {
      (context != nullptr ? *context : defaultContext()).write(level, text);
      if (standardError().enabled && level <= standardError().level) {
        std::string line = std::string("lmxagentd ") + levelName(level) + ": " + text;
        if (line.back() != '\n') line += '\n';
        [[maybe_unused]] const ssize_t n = ::write(STDERR_FILENO, line.data(), line.size());
      }
    }
  }
  errno = saved;
}

void setLogSinkForTesting(LogSink function, void* user) {
  const std::lock_guard lock(sink().mutex);
  sink().function = function;
  sink().user = user;
}

}  // namespace lmx

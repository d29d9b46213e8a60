// Sends messages to the system log (one datagram per message to "/dev/log") from any thread, without
// blocking.
#pragma once
#include <cstdarg>
#include <string>

namespace lmx {

/// The levels are syslog priorities.
enum LogLevel : int {
  kLogAlert = 1,
  kLogCritical = 2,
  kLogError = 3,
  kLogWarning = 4,
  kLogNotice = 5,
  kLogInfo = 6,
  kLogDebug = 7,
};

/// A connection to the system log under one program name and facility. Null means the default context.
struct LogContext;
using LMPLogContext = LogContext*;

/// @param facility  facility name; "com.zandor.lumex" maps to LOG_DAEMON, syslog facility names to
/// themselves, anything else to LOG_USER
/// @return null only when the context can't be created; a missing log daemon is not a failure
LMPLogContext LMPLogCreateContext(const char* program, const char* facility);

/// Closes and frees the context. Null is ignored. No other thread may use the context any more.
void LMPLogDestroyContext(LMPLogContext context);

/// Writes one message at `level` (a LogLevel) with printf conventions. Thread-safe, preserves errno, never
/// blocks: messages that the log daemon can't take are counted and reported as "N messages lost" once it is
/// back. Control characters are escaped; one trailing newline is kept. A message is at most 8 KiB.
/// When standard error is a terminal, or with LMXAGENTD_LOG=stderr, messages also go there with the name of
/// their level, filtered by LMXAGENTD_LOG_LEVEL (a number, default 7).
void LMPLogMessage(LMPLogContext context, int level, const char* format, ...)
    __attribute__((format(printf, 3, 4)));

/// For tests: sends every message (level, text) to `sink` instead of the log until it is reset to null. The
/// sink runs under a lock of the log and must not log.
using LogSink = void (*)(void* user, int level, const std::string& text);
void setLogSinkForTesting(LogSink sink, void* user);

}  // namespace lmx

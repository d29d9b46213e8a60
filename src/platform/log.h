// Messages to the system log: one datagram a message to "/dev/log", from any thread, never blocking.
#pragma once
#include <cstdarg>
#include <string>

namespace lmx {

/// The levels are the syslog priorities.
enum LogLevel : int {
  kLogAlert = 1,
  kLogCritical = 2,
  kLogError = 3,
  kLogWarning = 4,
  kLogNotice = 5,
  kLogInfo = 6,
  kLogDebug = 7,
};

/// A connection to the system log for one program name and facility. Null stands for the default context.
struct LogContext;
using LMPLogContext = LogContext*;

/// @param facility  a textual facility; "com.zandor.lumex" goes out as LOG_DAEMON, names of syslog facilities
///                  as themselves, anything else as LOG_USER
/// @return null only when the context can't be made: nobody listening on the socket is no failure.
LMPLogContext LMPLogCreateContext(const char* program, const char* facility);

/// Closes and frees it. Null is ignored. No other thread may use the context any more.
void LMPLogDestroyContext(LMPLogContext context);

/// Writes one message at `level` (LogLevel) with printf conventions. Thread-safe, keeps errno, never blocks:
/// what the log daemon can't take is counted and reported as "N messages lost" once it is back.
/// Control characters inside the text are escaped; one trailing newline is kept. At most 8 KiB a message.
/// On a terminal, or with LMXAGENTD_LOG=stderr, lines also go to standard error with their level's name,
/// there filtered by LMXAGENTD_LOG_LEVEL (a number, default 7).
void LMPLogMessage(LMPLogContext context, int level, const char* format, ...)
    __attribute__((format(printf, 3, 4)));

/// For tests: every message (level, text) goes to `sink` instead of the log until it is set back to null.
/// The sink runs under a lock of the log: it must not log.
using LogSink = void (*)(void* user, int level, const std::string& text);
void setLogSinkForTesting(LogSink sink, void* user);

}  // namespace lmx

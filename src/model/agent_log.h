// The log that the agent writes to.
#pragma once
#include <string>

#include "platform/log.h"
#include "support/shared_value.h"

namespace lmx {

/// Thread-safe. Writes to the default log until a context is set.
class AgentLog {
 public:
  [[nodiscard]] LMPLogContext log_context() const { return context_.get(); }
  /// Takes over `context` and closes the previous one, which no other thread may be using.
  void open(LMPLogContext context) { LMPLogDestroyContext(context_.exchange(context)); }

  // The message is logged verbatim, not as a format string.
  void logDebug(const std::string& message) const { log(kLogDebug, message); }
  void logInfo(const std::string& message) const { log(kLogInfo, message); }
  void logWarn(const std::string& message) const { log(kLogWarning, message); }

 private:
  void log(LogLevel level, const std::string& message) const {
    LMPLogMessage(log_context(), level, "%s", message.c_str());
  }
  SharedValue<LMPLogContext> context_;
};

}  // namespace lmx

// The agent's context as one channel holds it, with the shortcuts that every handler needs.
#pragma once
#include <memory>
#include <string>

#include "model/agent_context.h"
#include "support/shared_value.h"

namespace lmx {

/// Holds the context until release(). A command may still be running then, so each use asks for it anew and
/// must expect none. Thread-safe.
class ChannelContext {
 public:
  explicit ChannelContext(std::shared_ptr<AgentContext> context) : context_(std::move(context)) {}

  /// Null once it has been released.
  [[nodiscard]] std::shared_ptr<AgentContext> get() const { return context_.get(); }
  /// The recording session; null without a context.
  [[nodiscard]] std::shared_ptr<AgentRecord> session() const;
  void release() { context_.set(nullptr); }

  /// The context's log; null (the default log) without a context.
  [[nodiscard]] LMPLogContext log() const;
  // Without a context these log nothing.
  void logDebug(const std::string& message) const;
  void logInfo(const std::string& message) const;

 private:
  SharedValue<std::shared_ptr<AgentContext>> context_;
};

}  // namespace lmx

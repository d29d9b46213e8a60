// A peer that writes down what it is told.
#pragma once
#include <functional>
#include <string>
#include <vector>

#include "control/handlers/reply_sink.h"
#include "tests/unit/doubles/journal.h"

namespace lmx::testing {

/// Thread-safe.
class CollectedReplies final : public ReplySink {
 public:
  std::function<void()> on_reply;
  void sendReply(const std::string& reply) override {
    if (on_reply) on_reply();
    replies_.add(reply);
  }
  [[nodiscard]] std::vector<std::string> all() const { return replies_.entries(); }
  /// "(none)" when there is none.
  [[nodiscard]] std::string last() const { return all().empty() ? "(none)" : all().back(); }

 private:
  Journal replies_;
};

}  // namespace lmx::testing

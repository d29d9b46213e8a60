// A scripted child runner and service manager.
#pragma once
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/child_process.h"
#include "platform/service_manager.h"

namespace lmx::testing {

/// Records the argument vectors; every child ends with `result`. Thread-safe, except for the script.
class ScriptedChildRunner : public ChildRunner {
 public:
  ChildResult result{.end = ChildResult::End::exited, .status = 0, .output = {}};
  std::function<void()> on_run;
  /// Replaces `result`.
  std::function<ChildResult(const std::vector<std::string>& argv)> answer;

  ChildResult run(const std::vector<std::string>& argv, const ChildOptions& options) override {
    {
      const std::lock_guard lock(mutex_);
      runs_.push_back(argv);
      options_ = options;
    }
    if (on_run) on_run();
    return answer ? answer(argv) : result;
  }
  [[nodiscard]] std::vector<std::vector<std::string>> runs() const {
    const std::lock_guard lock(mutex_);
    return runs_;
  }
  /// Options of the last run.
  [[nodiscard]] ChildOptions options() const {
    const std::lock_guard lock(mutex_);
    return options_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::vector<std::string>> runs_;  // guarded by mutex_
  ChildOptions options_;                        // guarded by mutex_
};

/// Main thread only.
class ScriptedServiceManager : public ServiceManager {
 public:
  bool authorizes = true;
  std::optional<std::string> disable_error;

  bool authorize() override { return authorizes; }
  std::optional<std::string> disable(const std::string&) override { return disable_error; }
  bool isEnabled(const std::string&) override { return true; }
  int runShellCommand(const std::string& command) override {
    commands.push_back(command);
    return 0;
  }
  std::vector<std::string> commands;
};

}  // namespace lmx::testing

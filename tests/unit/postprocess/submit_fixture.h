// A context, a movie and a child runner for submission tests.
#pragma once
#include <gtest/gtest.h>

#include <deque>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "platform/child_process.h"
#include "platform/paths.h"
#include "postprocess/agent_submit.h"
#include "record/agent_record.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/test_root.h"

namespace lmx::testing {

/// Records what it was asked to run. Returns the scripted results, then success.
class ScriptedChildren : public ChildRunner {
 public:
  std::deque<ChildResult> results;
  std::function<void(const ChildOptions&)> on_run;

  ChildResult run(const std::vector<std::string>& argv, const ChildOptions& options) override {
    runs_.push_back(argv);
    options_ = options;
    if (on_run) on_run(options);
    if (results.empty()) return {ChildResult::End::exited, 0, {}};
    ChildResult result = results.front();
    results.pop_front();
    return result;
  }
  [[nodiscard]] const std::vector<std::vector<std::string>>& runs() const { return runs_; }
  [[nodiscard]] const ChildOptions& options() const { return options_; }

 private:
  std::vector<std::vector<std::string>> runs_;
  ChildOptions options_;
};

inline SharedDictionary shared(Dictionary dictionary) {
  return std::make_shared<const Dictionary>(std::move(dictionary));
}

/// An agent bound to a server, with an empty repository.
class SubmitFixture : public ::testing::Test {
 protected:
  SubmitFixture() {
    kTestRoot.clear();
    std::filesystem::create_directories(repository());
    context_->server.lumex_url.set("https://lumex.example");
    context_->recording.recording_repository_path.set(repository());
    context_->state.running.set(true);
  }
  /// Breaks the cycle: the list and its jobs hold the context.
  ~SubmitFixture() override { context_->cleanup(); }

  static std::string repository() { return kTestRoot.path() + "/recordings"; }
  static std::string inRepository(const std::string& name) { return repository() + "/" + name; }
  static void write(const std::string& path, const std::string& content) {
    std::ofstream(path, std::ios::binary) << content;
  }
  static std::optional<std::string> contentOf(const std::string& path) {
    const std::ifstream file(path, std::ios::binary);
    if (!file) return std::nullopt;
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
  }
  static std::filesystem::perms modeOf(const std::string& path) {
    return std::filesystem::status(path).permissions();
  }
  static std::size_t filesInRepository() {
    const std::filesystem::directory_iterator all(repository());
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
  }

  std::shared_ptr<AgentContext> context_ = newAgentContext();
  ScriptedChildren children_;
  LogCapture log_;
};

inline void PrintTo(const LogCapture::Entry& entry, std::ostream* out) {
  *out << entry.level << " " << entry.text;
}

}  // namespace lmx::testing

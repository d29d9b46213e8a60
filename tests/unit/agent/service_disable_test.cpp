// Shutdown of an agent whose configuration can't work: exit status and calls of the service manager.
#include "agent/service_disable.h"

#include "tests/unit/agent/agent_fixture.h"

// The thread sanitizer does not support the forks of these tests.
#if !defined(__SANITIZE_THREAD__)

namespace lmx {
namespace {

/// Reports calls on standard error, the only output that outlives the process.
class TellingServiceManager : public testing::ScriptedServiceManager {
 public:
  std::optional<std::string> disable(const std::string& job) override {
    std::fprintf(stderr, "disable %s\n", job.c_str());
    return disable_error;
  }
  int runShellCommand(const std::string& command) override {
    std::fprintf(stderr, "shell %s\n", command.c_str());
    return 0;
  }
};

class ServiceDisable : public ::testing::Test {
 protected:
  ServiceDisable() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
  [[noreturn]] void disable() const {
    setLogSinkForTesting(
        [](void*, int level, const std::string& text) {
          std::fprintf(stderr, "%d %s\n", level, text.c_str());
        },
        nullptr);
    disableService(*services_);
  }
  std::shared_ptr<TellingServiceManager> services_ = std::make_shared<TellingServiceManager>();
};

constexpr const char* kDisabling = "5 Disabling lmxagentd with keeperd\\.\\.\\.\n";
constexpr const char* kFallback =
    "2 Removing job from keeperd\\.\nshell /bin/keeperctl -1 remove com.zandor.lmxagentd\n";

TEST_F(ServiceDisable, EndsWithSeventyEight) {
  EXPECT_EXIT(disable(), ::testing::ExitedWithCode(78),
              std::string("^") + kDisabling + "disable com.zandor.lmxagentd\n$");
}

TEST_F(ServiceDisable, ThatFailsRemovesTheJobAndEndsWithSeventyOne) {
  services_->disable_error = "no such unit";
  // The message ends in a line feed of its own.
  EXPECT_EXIT(disable(), ::testing::ExitedWithCode(71),
              std::string(kDisabling) +
                  "disable com.zandor.lmxagentd\n"
                  "2 Unable to disable lmxagentd\\. KeeperToggle: error: no such unit\n\n" +
                  kFallback);
}

TEST_F(ServiceDisable, WithoutAuthorizationRemovesTheJobAndEndsWithSeventyOne) {
  services_->authorizes = false;
  EXPECT_EXIT(disable(), ::testing::ExitedWithCode(71), std::string("^") + kDisabling + kFallback + "$");
}

}  // namespace
}  // namespace lmx

#endif

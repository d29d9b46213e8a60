// Fixed paths and unique identifiers.
#include "platform/paths.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>

#include "platform/identifiers.h"
#include "tests/unit/doubles/test_root.h"

namespace lmx {
namespace {

TEST(SystemPath, IsPrefixedWithTheRoot) {
  EXPECT_EQ(systemPath(kPidFile), testing::kTestRoot.path() + "/var/run/lmxagentd.pid");
}

TEST(SystemPath, ReadsTheEnvironmentOnce) {
  const std::string before = systemPath("/x");
  const char* const value = getenv("LMXAGENTD_ROOT");
  const std::string kept = value != nullptr ? value : "";
  setenv("LMXAGENTD_ROOT", "/elsewhere", 1);
  EXPECT_EQ(systemPath("/x"), before);
  setenv("LMXAGENTD_ROOT", kept.c_str(), 1);
}

TEST(DirectoryOf, IsEverythingBeforeTheLastSlash) {
  struct Case {
    const char* path;
    const char* directory;
  };
  constexpr Case kCases[] = {{"/a/b/c", "/a/b"}, {"/a", "/"}, {"a", "."}, {"a/b", "a"},
                             {"/a/b/", "/a/b"},  {"", "."},   {"/", "/"}};
  for (const auto& [path, directory] : kCases) EXPECT_EQ(directoryOf(path), directory) << path;
}

TEST(NewUuid, IsUpperCaseVersionFour) {
  EXPECT_THAT(newUUIDString(),
              ::testing::MatchesRegex("[0-9A-F]{8}-[0-9A-F]{4}-4[0-9A-F]{3}-[89AB][0-9A-F]{3}-[0-9A-F]{12}"));
}

TEST(NewUuid, NeverRepeats) {
  std::set<std::string> seen;
  for (int i = 0; i < 1000; ++i) EXPECT_TRUE(seen.insert(newUUIDString()).second);
}

}  // namespace
}  // namespace lmx

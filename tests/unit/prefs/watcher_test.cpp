// Detecting changes of the preferences file.
#include <gmock/gmock.h>
#include <unistd.h>

#include "prefs/agent_settings.h"
#include "record/agent_record.h"
#include "tests/unit/prefs/prefs_fixture.h"

namespace lmx {
namespace {

using ::testing::IsEmpty;
using namespace std::chrono_literals;

constexpr const char* kDeleted = "The agent preferences file has been deleted";

class PreferenceWatcher : public testing::PrefsFixture {
 protected:
  static std::string named(const char* camera) {
    return propertyListXml(PlistDictionary{{"CameraName", camera}});
  }
};

TEST_F(PreferenceWatcher, NothingChangedIsFalseAtOnce) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  const auto start = std::chrono::steady_clock::now();
  for (int i = 0; i < 100; ++i) EXPECT_FALSE(prefs.prefsFileChanged());
  // If a poll waited even 50 ms, these would take 5 s.
  EXPECT_LT(std::chrono::steady_clock::now() - start, 5s);
}

TEST_F(PreferenceWatcher, WithoutAFileNothingChanges) {
  AgentPreferences prefs;
  EXPECT_FALSE(prefs.prefsFileChanged());
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(PreferenceWatcher, AFileThatAppearsIsReportedOnce) {
  AgentPreferences prefs;
  replace({{"CameraName", "Hall 3"}});
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 3");
  EXPECT_FALSE(prefs.prefsFileChanged());
}

TEST_F(PreferenceWatcher, DeletionIsReportedAndLoggedOnceAndNothingIsReadUntilTheFileReturns) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  std::filesystem::remove(systemFile());
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(prefs.getFromPrefsFile("CameraName"), std::nullopt);
  EXPECT_FALSE(prefs.prefsFileChanged());
  EXPECT_EQ(log_.count(kLogCritical, kDeleted), 1);
  replace({{"CameraName", "Hall 4"}});
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 4");
  EXPECT_EQ(log_.count(kLogCritical, kDeleted), 1);
}

TEST_F(PreferenceWatcher, AfterADeletionABoundAgentFailsAtItsCameraName) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  std::filesystem::remove(systemFile());
  ASSERT_TRUE(prefs.prefsFileChanged());
  const auto context = newAgentContext();
  EXPECT_FALSE(setAgentPreferencesInContext(prefs, *context));
  EXPECT_TRUE(
      log_.contains(kLogError, "lmxagentd cannot run in agent mode without being bound to a Lumex server."));
}

TEST_F(PreferenceWatcher, AReplacementIsReadFromDiskAndTheNewFileIsWatched) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  for (const char* name : {"Hall 4", "Hall 5", "Hall 6"}) {
    replace({{"CameraName", name}});
    EXPECT_TRUE(prefs.prefsFileChanged()) << name;
    EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), name);
    EXPECT_FALSE(prefs.prefsFileChanged()) << name;
  }
  EXPECT_FALSE(log_.contains(kLogCritical, kDeleted));
}

TEST_F(PreferenceWatcher, DeletedAndMadeAgainBetweenTwoPollsIsAReplacement) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  std::filesystem::remove(systemFile());
  writeText(named("Hall 4"));
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 4");
  EXPECT_FALSE(log_.contains(kLogCritical, kDeleted));
}

TEST_F(PreferenceWatcher, AnInPlaceWriteIsReportedButReadFromTheCache) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  writeInPlace(named("Hall 4"));
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 3");
  EXPECT_FALSE(prefs.prefsFileChanged());
}

TEST_F(PreferenceWatcher, AGrowingFileIsReportedButReadFromTheCache) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  std::ofstream(systemFile(), std::ios::app) << "\n<!-- seen -->\n";
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_TRUE(prefs.prefsDict());
}

TEST_F(PreferenceWatcher, AChangeOfModeIsReportedAndTheCacheKept) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  // File timestamps tick slowly: a change within one tick of the last poll can't be detected.
  const auto deadline = std::chrono::steady_clock::now() + 10s;
  bool changed = false;
  for (mode_t mode = 0600; !changed && std::chrono::steady_clock::now() < deadline; mode ^= 0044U) {
    ASSERT_EQ(chmod(systemFile().c_str(), mode), 0);
    changed = prefs.prefsFileChanged();
  }
  EXPECT_TRUE(changed);
  EXPECT_TRUE(prefs.prefsDict());
}

TEST_F(PreferenceWatcher, SettingUpAgainDropsTheCache) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  prefs.setupPrefsFileWatcher();
  EXPECT_EQ(prefs.prefsDict(), std::nullopt);
}

TEST_F(PreferenceWatcher, ManyShortLivedObjectsLeaveNoDescriptorBehind) {
  replace({{"CameraName", "Hall 3"}});
  const auto openDescriptors = [] {
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return std::distance(begin(all), end(all));
  };
  const auto before = openDescriptors();
  for (int i = 0; i < 40; ++i) AgentPreferences().getFromPrefsFile("CameraName");
  EXPECT_EQ(openDescriptors(), before);
}

}  // namespace
}  // namespace lmx

// Settings files that can't be read for a moment.
#include "prefs/steady_reading.h"

#include <gmock/gmock.h>

#include <cerrno>

#include "model/agent_context.h"
#include "prefs/agent_settings.h"
#include "prefs/recording_context.h"
#include "prefs/shared_secret.h"
#include "tests/unit/prefs/prefs_fixture.h"
#include "tests/unit/prefs/scripted_catalog.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using Entry = testing::LogCapture::Entry;

class SteadyReadingTest : public testing::PrefsFixture {
 protected:
  static std::string begin(const std::string& path, int error) {
    return "The settings file \"" + path + "\" can't be read at present: " + std::strerror(error) +
           " (errno " + std::to_string(error) + ")";
  }
  static std::string over(const std::string& path) {
    return "The settings file \"" + path + "\" can be read again";
  }
  static std::string secretFile() { return sharedSecretFile("SERVER-1"); }
};

TEST(PassingFailure, IsOneThatTheSameFileMaySurvive) {
  for (const int error : {EMFILE, ENFILE, ENOMEM, EIO, EACCES, EPERM, EINTR, ESTALE, ETIMEDOUT, EAGAIN}) {
    EXPECT_TRUE(isPassing({"", error})) << std::strerror(error);
  }
  for (const int error : {0, ENOENT, ENOTDIR, ELOOP, EISDIR, EINVAL, EFBIG, ENAMETOOLONG, ENXIO}) {
    EXPECT_FALSE(isPassing({"", error})) << std::strerror(error);
  }
}

TEST_F(SteadyReadingTest, APassingFailureKeepsWhatWasReadAndIsLoggedOnceAtEitherEnd) {
  replace({{"CameraName", "Hall 3"}});
  ASSERT_TRUE(readSteadily(systemFile()).file);
  replace({{"CameraName", "Hall 4"}});
  failReading(systemFile(), EMFILE);
  for (int i = 0; i < 3; ++i) {
    const SteadyReading reading = readSteadily(systemFile());
    ASSERT_TRUE(reading.unreadable);
    EXPECT_EQ(reading.unreadable->systemError, EMFILE);
    ASSERT_TRUE(reading.file);
    EXPECT_EQ(*reading.file->textUnder("CameraName"), "Hall 3");
  }
  failReading(systemFile(), 0);
  const SteadyReading reading = readSteadily(systemFile());
  EXPECT_FALSE(reading.unreadable);
  EXPECT_EQ(*reading.file->textUnder("CameraName"), "Hall 4");
  EXPECT_THAT(messages(), ElementsAre(Entry{kLogError, begin(systemFile(), EMFILE)},
                                      Entry{kLogNotice, over(systemFile())}));
}

TEST_F(SteadyReadingTest, WithoutAnEarlierReadingTheReasonIsAllThereIs) {
  replace({{"CameraName", "Hall 3"}});
  failReading(systemFile(), EIO);
  const SteadyReading reading = readSteadily(systemFile());
  ASSERT_FALSE(reading.file);
  EXPECT_EQ(reading.file.error().systemError, EIO);
  EXPECT_TRUE(reading.unreadable);
}

TEST_F(SteadyReadingTest, AnAbsentOrMalformedFileIsNoPassingFailure) {
  EXPECT_FALSE(readSteadily(systemFile()).unreadable);
  writeText("no property list");
  EXPECT_FALSE(readSteadily(systemFile()).unreadable);
  std::filesystem::remove(systemFile());
  std::filesystem::create_directory(systemFile());
  EXPECT_FALSE(readSteadily(systemFile()).unreadable);
  EXPECT_THAT(messages(), ElementsAre());
}

TEST_F(SteadyReadingTest, AChangeIsReportedOnceItCanBeRead) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  replace({{"CameraName", "Hall 4"}});
  failReading(systemFile(), EACCES);
  for (int i = 0; i < 5; ++i) EXPECT_FALSE(prefs.prefsFileChanged());
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 3");
  prefs.resetPrefsCache();
  failReading(systemFile(), 0);
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 4");
  EXPECT_FALSE(prefs.prefsFileChanged());
  EXPECT_EQ(log_.count(kLogError, begin(systemFile(), EACCES)), 1);
  EXPECT_EQ(log_.count(kLogNotice, over(systemFile())), 1);
}

TEST_F(SteadyReadingTest, AChangeWaitsForTheSecretThatItNames) {
  replace({{"ServerUUID", "SERVER-0"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("ServerUUID");
  replace({{"ServerUUID", "SERVER-1"}});
  failReading(secretFile(), EMFILE);
  EXPECT_FALSE(prefs.prefsFileChanged());
  EXPECT_FALSE(prefs.prefsFileChanged());
  EXPECT_EQ(log_.count(kLogError, begin(secretFile(), EMFILE)), 1);
  failReading(secretFile(), 0);
  EXPECT_TRUE(prefs.prefsFileChanged()) << "there is none: that is for the settings to tell";
}

TEST_F(SteadyReadingTest, ADeletedFileIsReportedThoughItCouldNotBeReadBefore) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  replace({{"CameraName", "Hall 4"}});
  failReading(systemFile(), EIO);
  EXPECT_FALSE(prefs.prefsFileChanged());
  failReading(systemFile(), 0);
  std::filesystem::remove(systemFile());
  EXPECT_TRUE(prefs.prefsFileChanged());
  EXPECT_EQ(prefs.getFromPrefsFile("CameraName"), std::nullopt);
}

TEST_F(SteadyReadingTest, ARecordingHasTheSettingsThatWereLastRead) {
  testing::ScriptedCatalog catalog;
  replace({{"RecordingType", "Audio+Video"},
           {"RecordingVideoInput", "camera"},
           {"RecordingAudioInput", "microphone"},
           {"RecordingRepositoryPath", "/recordings"}});
  ASSERT_NE(newRecordingContextForDaemon(catalog), nullptr);
  for (const int error : {EMFILE, ENFILE, ENOMEM, EIO, EACCES, EINTR, ESTALE}) {
    failReading(systemFile(), error);
    const auto context = newRecordingContextForDaemonWithRecordingType(catalog, CaptureType::audioAndVideo);
    ASSERT_NE(context, nullptr) << std::strerror(error);
    EXPECT_EQ(context->captureTempDir, "/recordings");
    EXPECT_NE(newRecordingContextForDaemon(catalog), nullptr) << "the camera retry";
  }
  failReading(systemFile(), ENOENT);
  EXPECT_THROW(newRecordingContextForDaemon(catalog), PreferenceError);
}

TEST_F(SteadyReadingTest, AnObsoleteKeyIsNotReplacedInAFileThatCannotBeRead) {
  replace({{"RecordingPreviewIntervalInSeconds", "2"}});
  ASSERT_TRUE(readSteadily(systemFile()).file);
  replace({{"CameraName", "Hall 4"}});
  failReading(systemFile(), EIO);
  AgentPreferences().migrateOldKeys();
  EXPECT_EQ(readPropertyList(systemFile())->under("PreviewIntervalInMilliseconds"), nullptr);
  EXPECT_NE(readPropertyList(systemFile())->under("CameraName"), nullptr) << "not written over";
}

TEST_F(SteadyReadingTest, TheStartLearnsTheReason) {
  replace({{"ServerUUID", "SERVER-1"}});
  EXPECT_FALSE(AgentPreferences().whyUnreadable()) << "an absent secret is none";
  failReading(secretFile(), EACCES);
  EXPECT_EQ(AgentPreferences().whyUnreadable()->systemError, EACCES);
  failReading(systemFile(), EMFILE);
  EXPECT_EQ(AgentPreferences().whyUnreadable()->systemError, EMFILE);
  failReading(systemFile(), ENOENT);
  EXPECT_FALSE(AgentPreferences().whyUnreadable());
}

}  // namespace
}  // namespace lmx

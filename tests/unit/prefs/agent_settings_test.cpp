// Copying the settings into the context.
#include "prefs/agent_settings.h"

#include <arpa/inet.h>
#include <gmock/gmock.h>

#include <functional>

#include "record/agent_record.h"
#include "tests/unit/prefs/prefs_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Entry = testing::LogCapture::Entry;

constexpr const char* kNotBound = "lmxagentd cannot run in agent mode without being bound to a Lumex server.";
constexpr const char* kSecret = "AAECAwQFBgcICQoLDA0ODw==";  // bytes 0 to 15
constexpr const char* kContinuousInvalid = "Continuous capture is enabled, but the preferences are invalid.";

std::string required(const std::string& tag) {
  return "\"" + tag + "\" tag was not found or value is empty, this field is required";
}

class Settings : public testing::PrefsFixture {
 protected:
  Settings() { writeSecret(kSecret); }

  static std::string secretFile() { return systemPath(kSecretsDirectory) + "/SERVER-1.plist"; }
  static void writeSecret(const PlistValue& secret) {
    std::filesystem::create_directories(systemPath(kSecretsDirectory));
    ASSERT_EQ(writePropertyList(secretFile(), PlistDictionary{{"lmx_secret", secret}}), 0);
  }
  static PlistDictionary bound() {
    return {{"CameraName", "Hall 3"},
            {"CameraUUID", "CAMERA-1"},
            {"ServerUUID", "SERVER-1"},
            {"LumexURL", "https://lumex.example"},
            {"TunnelHost", "tunnel.example"},
            {"TunnelPort", "8170"},
            {"RecordingRepositoryPath", "/recordings"},
            {"RecordingType", "Audio+Video"},
            {"RecordingDiskSpaceCutoffInMB", "2048"},
            {"RecordingVideoMaximumFrameRate", "25"}};
  }
  static PlistDictionary continuous(bool enabled, double percent, std::int64_t length) {
    return {{"Enabled", enabled},
            {"RecordingSegmentLength", length},
            {"ContinuousUpload", true},
            {"RecordingDiskSpaceCutoffPercentLeft", percent}};
  }
  bool read(const PlistDictionary& dictionary) {
    replace(dictionary);
    AgentPreferences prefs;
    return setAgentPreferencesInContext(prefs, *context_);
  }

  std::shared_ptr<AgentContext> context_ = newAgentContext();
};

TEST_F(Settings, ABoundAgentGetsAllOfThem) {
  PlistDictionary all = bound();
  all["PreviewPath"] = "/preview.jpg";
  all["RecordingCapturePreset"] = "Video:Best";
  all["ContinuousRecording"] = continuous(true, 12.5, 10);
  ASSERT_TRUE(read(all));
  EXPECT_EQ(context_->server.machine_name.get(), "Hall 3");
  EXPECT_EQ(context_->server.machine_uuid.get(), "CAMERA-1");
  EXPECT_EQ(context_->server.server_uuid.get(), "SERVER-1");
  EXPECT_EQ(context_->server.lumex_url.get(), "https://lumex.example");
  EXPECT_EQ(context_->server.tunnel_host.get(), "tunnel.example");
  EXPECT_EQ(context_->server.tunnel_port.get(), "8170");
  EXPECT_EQ(context_->recording.recording_repository_path.get(), "/recordings");
  EXPECT_EQ(context_->recording.recording_type.get(), "Audio+Video");
  EXPECT_EQ(context_->recording.recording_video_maximum_frame_rate.get(), "25");
  EXPECT_EQ(context_->recording.preview_file.get(), "/preview.jpg");
  EXPECT_EQ(context_->recording.capture_preset.get(), "Video:Best");
  EXPECT_EQ(context_->record_context()->recordingType.get(), kRecordingTypeAudioVideo);
  EXPECT_EQ(context_->record_context()->diskSpaceCutoffInMB.get(), 2048U);
  EXPECT_EQ(context_->recording.continuous.get(), (LMRContinuousRecordingInfo{12.5, 10, true, true}));
  EXPECT_THAT(messages(), ElementsAre(Entry{kLogInfo, "Reading preferences..."}));
}

struct Failure {
  const char* name;
  std::function<void(PlistDictionary&)> change;
  std::vector<Entry> said;
};
Failure missing(const char* name, const char* key, std::vector<Entry> said) {
  return {name, [key](PlistDictionary& all) { all.erase(key); }, std::move(said)};
}
Failure with(const char* name, const char* key, PlistValue value, std::vector<Entry> said) {
  return {name, [key, value](PlistDictionary& all) { all[key] = value; }, std::move(said)};
}
/// Sets `also` beside the key that makes the reading fail.
Failure withType(const char* name, const char* type, Failure failure) {
  return {name,
          [type, change = failure.change](PlistDictionary& all) {
            all["RecordingType"] = type;
            change(all);
          },
          std::move(failure.said)};
}

class SettingsFailure : public Settings, public ::testing::WithParamInterface<Failure> {};

TEST_P(SettingsFailure, IsLoggedAndRefused) {
  PlistDictionary all = bound();
  GetParam().change(all);
  EXPECT_FALSE(read(all));
  std::vector<Entry> expected{{kLogInfo, "Reading preferences..."}};
  expected.insert(expected.end(), GetParam().said.begin(), GetParam().said.end());
  EXPECT_EQ(messages(), expected);
}

std::vector<Entry> tag(const char* name) { return {{kLogCritical, required(name)}}; }
const std::vector<Entry> kUnbound{{kLogError, kNotBound}};
const std::vector<Entry> kUnknownType{{kLogCritical, "\"Type\" tag value is not known"}};
const std::vector<Entry> kNoPath{
    {kLogCritical,
     "\"RecordingPath\" tag was not found or value is empty, this field is required for the \"File\" "
     "recording type"}};
const std::vector<Entry> kBadContinuous{{kLogCritical, kContinuousInvalid}};

PlistDictionary enabled(double percent, std::int64_t length) {
  return {{"Enabled", true},
          {"RecordingDiskSpaceCutoffPercentLeft", percent},
          {"RecordingSegmentLength", length}};
}

INSTANTIATE_TEST_SUITE_P(
    All, SettingsFailure,
    ::testing::Values(
        missing("NoCameraName", "CameraName", kUnbound), missing("NoCameraUUID", "CameraUUID", kUnbound),
        missing("NoServerUUID", "ServerUUID", kUnbound),
        missing("NoLumexURLIsCalledServerURL", "LumexURL", tag("ServerURL")),
        with("EmptyLumexURL", "LumexURL", "", tag("ServerURL")),
        missing("NoTunnelHost", "TunnelHost", tag("TunnelHost")),
        with("EmptyTunnelHost", "TunnelHost", "", tag("TunnelHost")),
        missing("NoTunnelPort", "TunnelPort", tag("TunnelPort")),
        with("EmptyTunnelPort", "TunnelPort", "", tag("TunnelPort")),
        missing("NoRepository", "RecordingRepositoryPath", tag("RecordingRepositoryPath")),
        with("EmptyRepository", "RecordingRepositoryPath", "", tag("RecordingRepositoryPath")),
        missing("NoType", "RecordingType", tag("RecordingType")),
        with("EmptyType", "RecordingType", "", tag("RecordingType")),
        with("UnknownType", "RecordingType", "audio", kUnknownType),
        withType("FileWithoutPath", "File", missing("", "RecordingPath", kNoPath)),
        withType("FileWithEmptyPath", "File", with("", "RecordingPath", "", kNoPath)),
        missing("NoDiskCutoff", "RecordingDiskSpaceCutoffInMB", tag("RecordingDiskSpaceCutoffInMB")),
        with("EmptyDiskCutoff", "RecordingDiskSpaceCutoffInMB", "", tag("RecordingDiskSpaceCutoffInMB")),
        missing("NoFrameRate", "RecordingVideoMaximumFrameRate", tag("RecordingVideoMaximumFrameRate")),
        withType("VideoWithoutFrameRate", "Video",
                 missing("", "RecordingVideoMaximumFrameRate", tag("RecordingVideoMaximumFrameRate"))),
        withType("VideoWithEmptyFrameRate", "Video",
                 with("", "RecordingVideoMaximumFrameRate", "", tag("RecordingVideoMaximumFrameRate"))),
        with("ContinuousWithoutSegments", "ContinuousRecording", enabled(10, 0), kBadContinuous),
        with("ContinuousWithoutCutoff", "ContinuousRecording", enabled(0, 10), kBadContinuous),
        with("ContinuousWithNegativeCutoff", "ContinuousRecording", enabled(-1, 10), kBadContinuous),
        with("ContinuousWithNothingElse", "ContinuousRecording", PlistDictionary{{"Enabled", true}},
             kBadContinuous)),
    [](const auto& instance) { return instance.param.name; });

struct Accepted {
  const char* name;
  std::function<void(PlistDictionary&)> change;
};
class SettingsSuccess : public Settings, public ::testing::WithParamInterface<Accepted> {};

TEST_P(SettingsSuccess, IsSilent) {
  PlistDictionary all = bound();
  GetParam().change(all);
  EXPECT_TRUE(read(all));
  EXPECT_THAT(messages(), ElementsAre(Entry{kLogInfo, "Reading preferences..."}));
}

INSTANTIATE_TEST_SUITE_P(
    All, SettingsSuccess,
    ::testing::Values(Accepted{"AudioNeedsNoFrameRate",
                               [](PlistDictionary& all) {
                                 all["RecordingType"] = "Audio";
                                 all.erase("RecordingVideoMaximumFrameRate");
                               }},
                      Accepted{"FileNeedsNoFrameRate",
                               [](PlistDictionary& all) {
                                 all["RecordingType"] = "File";
                                 all["RecordingPath"] = "/movie.mov";
                                 all.erase("RecordingVideoMaximumFrameRate");
                               }},
                      Accepted{"EmptyIdentityIsNotMissing",
                               [](PlistDictionary& all) { all["CameraName"] = all["CameraUUID"] = ""; }},
                      Accepted{"ContinuousOffIsNotChecked",
                               [](PlistDictionary& all) {
                                 all["ContinuousRecording"] =
                                     PlistDictionary{{"Enabled", false}, {"RecordingSegmentLength", 0.0}};
                               }}),
    [](const auto& instance) { return instance.param.name; });

struct Port {
  const char* text;
  std::uint16_t number;
};

TEST_F(Settings, TheListenerPortIsStoredInNetworkOrderAndLogged) {
  for (const Port& port : {Port{"8170", 8170}, Port{"70000", 4464}, Port{"8170x", 8170}, Port{"none", 0}}) {
    PlistDictionary all = bound();
    all["TCPListenerPort"] = port.text;
    ASSERT_TRUE(read(all)) << port.text;
    EXPECT_EQ(context_->server.tcp_listener_port.get(), htons(port.number)) << port.text;
    EXPECT_TRUE(log_.contains(kLogNotice, "TCP listener port: " + std::to_string(port.number))) << port.text;
  }
}

TEST_F(Settings, WithoutAListenerPortTheFieldIsLeftAsItIs) {
  context_->server.tcp_listener_port.set(htons(99));
  ASSERT_TRUE(read(bound()));
  EXPECT_EQ(context_->server.tcp_listener_port.get(), htons(99));
}

TEST_F(Settings, TheSecretIsStoredAndNeverLogged) {
  ASSERT_TRUE(read(bound()));
  const auto secret = context_->server.shared_secret.get();
  ASSERT_TRUE(secret);
  for (unsigned char i = 0; i < 16; ++i) EXPECT_EQ((*secret)[i], i);
  EXPECT_FALSE(log_.mentions(kSecret));
}

TEST_F(Settings, AMissingSecretsFileIsTwoErrorLines) {
  std::filesystem::remove(secretFile());
  EXPECT_FALSE(read(bound()));
  EXPECT_THAT(messages(),
              ElementsAre(Entry{kLogInfo, "Reading preferences..."},
                          Entry{kLogError, "Failed to read shared secret from plist: " + secretFile()},
                          Entry{kLogError, kNotBound}));
}

TEST_F(Settings, ASecretsFileWithoutTheKeyIsTwoErrorLines) {
  ASSERT_EQ(writePropertyList(secretFile(), PlistDictionary{{"secret", kSecret}}), 0);
  EXPECT_FALSE(read(bound()));
  EXPECT_TRUE(log_.contains(kLogError, "Failed to read shared secret from plist: " + secretFile()));
  EXPECT_TRUE(log_.contains(kLogError, kNotBound));
  EXPECT_FALSE(log_.mentions(kSecret));
}

TEST_F(Settings, WhiteSpaceAroundTheSecretIsIgnored) {
  const std::string secret = kSecret;
  for (const std::string& text :
       {secret + "\n", secret + "\r\n", "  " + secret, "\t" + secret + " \n\n", "\n" + secret}) {
    context_->server.shared_secret.set(std::nullopt);
    writeSecret(text);
    ASSERT_TRUE(read(bound())) << ::testing::PrintToString(text);
    const auto stored = context_->server.shared_secret.get();
    ASSERT_TRUE(stored) << ::testing::PrintToString(text);
    for (unsigned char i = 0; i < 16; ++i) EXPECT_EQ((*stored)[i], i);
  }
}

TEST_F(Settings, ASecretThatCannotBeUsedIsOneErrorLineWithFileAndReason) {
  struct Case {
    const char* secret;
    const char* reason;
  };
  const Case cases[] = {{"AAECAwQFBgcICQoLDA0O", "\"lmx_secret\" has 15 bytes instead of 16"},
                        {"AAECAwQFBgcICQoLDA0ODxA=", "\"lmx_secret\" has 17 bytes instead of 16"},
                        {"", "\"lmx_secret\" has 0 bytes instead of 16"},
                        {" \n", "\"lmx_secret\" has 0 bytes instead of 16"},
                        {"not base64!", "\"lmx_secret\" is not Base64 text"},
                        {"AAECAwQF\nBgcICQoLDA0ODw==", "\"lmx_secret\" is not Base64 text"}};
  for (const Case& one : cases) {
    const auto before = static_cast<std::ptrdiff_t>(messages().size());
    writeSecret(one.secret);
    EXPECT_FALSE(read(bound())) << one.secret;
    EXPECT_EQ(context_->server.shared_secret.get(), std::nullopt) << one.secret;
    auto lines = messages();
    lines.erase(lines.begin(), lines.begin() + before);
    EXPECT_THAT(lines, ElementsAre(Entry{kLogInfo, "Reading preferences..."},
                                   Entry{kLogError, "The shared secret in \"" + secretFile() +
                                                        "\" can't be used: " + one.reason}));
  }
}

TEST_F(Settings, AdHocModeSkipsBindingSecretAndRepository) {
  context_->options.adhoc.set(true);
  std::filesystem::remove(secretFile());
  PlistDictionary all = bound();
  all["TCPListenerPort"] = "8170";
  ASSERT_TRUE(read(all));
  EXPECT_EQ(context_->server.machine_name.get(), std::nullopt);
  EXPECT_EQ(context_->server.lumex_url.get(), std::nullopt);
  EXPECT_EQ(context_->server.tcp_listener_port.get(), 0);
  EXPECT_EQ(context_->server.shared_secret.get(), std::nullopt);
  EXPECT_EQ(context_->recording.recording_repository_path.get(), std::nullopt);
  EXPECT_EQ(context_->recording.recording_type.get(), "Audio+Video");
}

TEST_F(Settings, WithoutASessionReadingFailsAfterTheBindingKeys) {
  context_->releaseRecord();
  EXPECT_FALSE(read(bound()));
  EXPECT_TRUE(log_.contains(kLogCritical, "Internal error occurred creating record context"));
  EXPECT_EQ(context_->server.tunnel_port.get(), "8170");
  EXPECT_EQ(context_->recording.recording_repository_path.get(), std::nullopt);
}

TEST_F(Settings, AFailureKeepsTheFieldsBeforeItAndStoresWhatTheFailingKeyHad) {
  ASSERT_TRUE(read(bound()));
  PlistDictionary all = bound();
  all["CameraName"] = "Hall 4";
  all["LumexURL"] = "";
  all["TunnelHost"] = "elsewhere.example";
  EXPECT_FALSE(read(all));
  EXPECT_EQ(context_->server.machine_name.get(), "Hall 4");
  EXPECT_EQ(context_->server.lumex_url.get(), "");
  EXPECT_EQ(context_->server.tunnel_host.get(), "tunnel.example");
}

TEST_F(Settings, AnUnknownTypeIsStoredAnyway) {
  ASSERT_TRUE(read(bound()));
  PlistDictionary all = bound();
  all["RecordingType"] = "Hologram";
  EXPECT_FALSE(read(all));
  EXPECT_EQ(context_->recording.recording_type.get(), "Hologram");
  EXPECT_EQ(context_->record_context()->recordingType.get(), kRecordingTypeNone);
}

TEST_F(Settings, AKeyThatDisappearedLeavesItsFieldAbsent) {
  PlistDictionary all = bound();
  all["PreviewPath"] = "/preview.jpg";
  all["RecordingCapturePreset"] = "Video:Best";
  ASSERT_TRUE(read(all));
  ASSERT_TRUE(read(bound()));
  EXPECT_EQ(context_->recording.preview_file.get(), std::nullopt);
  EXPECT_EQ(context_->recording.capture_preset.get(), std::nullopt);
}

TEST_F(Settings, OnlyAFileRecordingReadsItsPath) {
  PlistDictionary all = bound();
  all["RecordingPath"] = "/movie.mov";
  ASSERT_TRUE(read(all));
  EXPECT_EQ(context_->recording.input_file.get(), std::nullopt);
  all["RecordingType"] = "File";
  ASSERT_TRUE(read(all));
  EXPECT_EQ(context_->recording.input_file.get(), "/movie.mov");
  EXPECT_EQ(context_->record_context()->recordingType.get(), kRecordingTypeFile);
}

TEST_F(Settings, AnIntegerIsAcceptedForAText) {
  PlistDictionary all = bound();
  all["RecordingDiskSpaceCutoffInMB"] = std::int64_t{512};
  ASSERT_TRUE(read(all));
  EXPECT_EQ(context_->record_context()->diskSpaceCutoffInMB.get(), 512U);
}

class Migration : public testing::PrefsFixture {};

TEST_F(Migration, TheObsoleteIntervalBecomesMilliseconds) {
  struct Interval {
    PlistValue seconds;
    const char* milliseconds;
  };
  const Interval kIntervals[] = {{"3", "400"},
                                 {"2", "2000"},
                                 {"0", "0"},
                                 {"none", "0"},
                                 {"-1", "-1000"},
                                 {std::int64_t{3}, "400"},
                                 {"3000000", "-1294967296"}};  // wraps in 32 bits
  for (const auto& [seconds, milliseconds] : kIntervals) {
    replace({{"RecordingPreviewIntervalInSeconds", seconds}, {"PreviewIntervalInMilliseconds", "7"}});
    AgentPreferences().migrateOldKeys();
    EXPECT_EQ(readPropertyList(systemFile()).value(),
              PlistValue(PlistDictionary{{"PreviewIntervalInMilliseconds", milliseconds}}));
  }
}

TEST_F(Migration, TheFileIsRewrittenOnceAndOtherKeysSurvive) {
  const PlistDictionary nested{{"Enabled", true}, {"Unknown", PlistArray{PlistValue("x")}}};
  replace({{"RecordingPreviewIntervalInSeconds", "2"}, {"Mine", nested}});
  const auto before = inodeOf(systemFile());
  AgentPreferences prefs;
  prefs.migrateOldKeys();
  const auto after = inodeOf(systemFile());
  EXPECT_NE(after, before);
  prefs.migrateOldKeys();
  AgentPreferences().migrateOldKeys();
  EXPECT_EQ(inodeOf(systemFile()), after);
  EXPECT_EQ(readPropertyList(systemFile()).value(),
            PlistValue(PlistDictionary{{"PreviewIntervalInMilliseconds", "2000"}, {"Mine", nested}}));
}

TEST_F(Migration, WithoutTheObsoleteKeyTheFileIsLeftAlone) {
  replace({{"PreviewIntervalInMilliseconds", "500"}});
  const auto before = inodeOf(systemFile());
  AgentPreferences().migrateOldKeys();
  EXPECT_EQ(inodeOf(systemFile()), before);
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(Migration, WithoutAFileNoneIsMade) {
  AgentPreferences().migrateOldKeys();
  EXPECT_FALSE(std::filesystem::exists(systemFile()));
}

TEST_F(Migration, AFileThatCannotBeWrittenIsAWarningAndTheNewValueHoldsInMemory) {
  replace({{"RecordingPreviewIntervalInSeconds", "2"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("RecordingPreviewIntervalInSeconds");
  std::filesystem::remove_all(directoryOf(systemFile()));
  prefs.migrateOldKeys();
  EXPECT_THAT(messages(),
              ElementsAre(Entry{kLogWarning, "The obsolete preview interval could not be replaced in " +
                                                 systemFile() + ": No such file or directory"}));
  EXPECT_EQ(text(prefs.getFromPrefsFile("PreviewIntervalInMilliseconds")), "2000");
}

}  // namespace
}  // namespace lmx

// Reading the preferences: the file, its cache and the layered domain.
#include <gmock/gmock.h>

#include <algorithm>

#include "prefs/adhoc_defaults.h"
#include "tests/unit/prefs/prefs_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using Entry = testing::LogCapture::Entry;

class PreferenceStore : public testing::PrefsFixture {};

TEST_F(PreferenceStore, ReadsAKeyOfTheFile) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 3");
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(PreferenceStore, MissingKeyIsADebugLine) {
  replace(PlistDictionary{});
  AgentPreferences prefs;
  EXPECT_EQ(prefs.getFromPrefsFile("CameraName"), std::nullopt);
  EXPECT_THAT(log_.entries(),
              ElementsAre(Entry{kLogDebug, "\"CameraName\" key was not found or value is empty"}));
}

TEST_F(PreferenceStore, MissingPreviewPathOrPreviewIntervalLogsNothing) {
  replace(PlistDictionary{});
  AgentPreferences prefs;
  EXPECT_EQ(prefs.getFromPrefsFile("PreviewPath"), std::nullopt);
  EXPECT_EQ(prefs.getFromPrefsFile("RecordingPreviewIntervalInSeconds"), std::nullopt);
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(PreferenceStore, AbsentFileYieldsNothingAndIsNoError) {
  AgentPreferences prefs;
  EXPECT_EQ(prefs.getFromPrefsFile("CameraName"), std::nullopt);
  EXPECT_EQ(prefs.prefsDict(), std::nullopt);
  EXPECT_THAT(messages(), IsEmpty());
}

TEST_F(PreferenceStore, TheCacheLivesUntilItIsReset) {
  replace({{"CameraName", "Hall 3"}});
  AgentPreferences prefs;
  prefs.getFromPrefsFile("CameraName");
  replace({{"CameraName", "Hall 4"}});
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 3");
  prefs.resetPrefsCache();
  EXPECT_EQ(prefs.prefsDict(), std::nullopt);
  EXPECT_EQ(text(prefs.getFromPrefsFile("CameraName")), "Hall 4");
}

struct MalformedFile {
  const char* name;
  std::string content;
  const char* reason;
};
class MalformedPreferences : public testing::PrefsFixture,
                             public ::testing::WithParamInterface<MalformedFile> {};

TEST_P(MalformedPreferences, OneErrorLineAResetNamesFileReasonAndConsequence) {
  writeText(GetParam().content);
  AgentPreferences prefs;
  const auto errors = [this] {
    const auto all = messages();
    return std::count_if(all.begin(), all.end(), [](const auto& m) { return m.level == kLogError; });
  };
  EXPECT_EQ(prefs.getFromPrefsFile("CameraName"), std::nullopt);
  EXPECT_EQ(prefs.getFromPrefsFile("MicName"), std::nullopt);
  EXPECT_EQ(prefs.get("MicName"), std::nullopt);
  EXPECT_EQ(errors(), 1);
  prefs.resetPrefsCache();
  EXPECT_EQ(prefs.getFromPrefsFile("CameraName"), std::nullopt);
  EXPECT_EQ(errors(), 2);
  EXPECT_EQ(messages()[0].level, kLogError);
  EXPECT_THAT(messages()[0].text, HasSubstr(systemFile()));
  EXPECT_THAT(messages()[0].text, HasSubstr(GetParam().reason));
  EXPECT_THAT(messages()[0].text, HasSubstr("Nothing is read from it"));
}

std::string nestedArrays(int depth) {
  std::string xml = "<plist version=\"1.0\"><dict><key>a</key>";
  for (int i = 0; i < depth; ++i) xml += "<array>";
  for (int i = 0; i < depth; ++i) xml += "</array>";
  return xml + "</dict></plist>";
}

INSTANTIATE_TEST_SUITE_P(
    All, MalformedPreferences,
    ::testing::Values(MalformedFile{"Empty", "", "empty"},
                      MalformedFile{"Words", "CameraName = Hall 3", "property list"},
                      MalformedFile{"CutShort", "<plist version=\"1.0\"><dict><key>CameraName</key><str", ""},
                      MalformedFile{"ArrayOnTop", "<plist version=\"1.0\"><array/></plist>",
                                    "not a dictionary"},
                      MalformedFile{"TooDeep", nestedArrays(kPlistDepthLimit + 1), ""},
                      MalformedFile{"TooLarge", std::string(kPlistFileLimit + 1, 'x'), "larger than"}),
    [](const auto& instance) { return instance.param.name; });

struct WronglyTyped {
  const char* name;
  const char* key;
  PlistValue value;
  const char* remedy;
};
class WronglyTypedPreference : public testing::PrefsFixture,
                               public ::testing::WithParamInterface<WronglyTyped> {};

TEST_P(WronglyTypedPreference, CountsAsMissingAndSaysHowToWriteIt) {
  replace({{GetParam().key, GetParam().value}});
  AgentPreferences prefs;
  EXPECT_EQ(prefs.getFromPrefsFile(GetParam().key), std::nullopt);
  const std::string line = std::string("The preference \"") + GetParam().key +
                           "\" has the wrong type and counts as missing; write it as a <" +
                           GetParam().remedy + ">.";
  EXPECT_THAT(messages(), ElementsAre(Entry{kLogError, line}));
}

INSTANTIATE_TEST_SUITE_P(
    All, WronglyTypedPreference,
    ::testing::Values(WronglyTyped{"Array", "CameraName", PlistArray{PlistValue("x")}, "string"},
                      WronglyTyped{"Dictionary", "CameraName", PlistDictionary{{"a", "b"}}, "string"},
                      WronglyTyped{"Flag", "CameraName", true, "string"},
                      WronglyTyped{"Data", "CameraName", PlistValue::Data{1, 2}, "string"},
                      WronglyTyped{"Date", "CameraName", PlistDate{1}, "string"},
                      WronglyTyped{"TextForDictionary", "ContinuousRecording", "on", "dict"},
                      WronglyTyped{"NumberForDictionary", "ContinuousRecording", std::int64_t{1}, "dict"}),
    [](const auto& instance) { return instance.param.name; });

TEST_F(PreferenceStore, NumbersCountAsTheirDecimalText) {
  replace({{"TunnelPort", std::int64_t{8170}},
           {"Negative", std::int64_t{-3}},
           {"Rate", 29.97},
           {"WholeRate", 30.0},
           {"Large", 1e21}});
  AgentPreferences prefs;
  EXPECT_EQ(text(prefs.getFromPrefsFile("TunnelPort")), "8170");
  EXPECT_EQ(text(prefs.getFromPrefsFile("Negative")), "-3");
  EXPECT_EQ(text(prefs.getFromPrefsFile("Rate")), "29.97");
  EXPECT_EQ(text(prefs.getFromPrefsFile("WholeRate")), "30");
  EXPECT_EQ(text(prefs.getFromPrefsFile("Large")), "1000000000000000000000");
  EXPECT_THAT(messages(), IsEmpty());
}

TEST_F(PreferenceStore, TheDomainPrefersTheUsersValueThenTheSystemsThenTheDefault) {
  replace(userFile(), {{"RecordingType", "Audio"}});
  replace({{"RecordingType", "Video"}, {"RecordingCapturePreset", "Video:Best"}});
  AgentPreferences prefs;
  EXPECT_EQ(text(prefs.get("RecordingType")), "Audio");
  EXPECT_EQ(text(prefs.get("RecordingCapturePreset")), "Video:Best");
  EXPECT_EQ(text(prefs.get("RecordingVideoMaximumFrameRate")), "30");
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(PreferenceStore, EveryAdHocDefaultIsVisibleInTheDomain) {
  AgentPreferences prefs;
  for (const auto& [key, value] : adHocDefaults()) EXPECT_EQ(prefs.get(key), value) << key;
}

TEST_F(PreferenceStore, AMissingDomainKeyIsANotice) {
  AgentPreferences prefs;
  EXPECT_EQ(prefs.get("CameraName"), std::nullopt);
  EXPECT_THAT(log_.entries(),
              ElementsAre(Entry{kLogNotice, "Unable to find preference for key: CameraName"}));
}

TEST_F(PreferenceStore, TheDomainReturnsTextsExceptForContinuousRecording) {
  replace({{"ContinuousRecording", PlistDictionary{{"Enabled", true}}}, {"TunnelPort", std::int64_t{8170}}});
  AgentPreferences prefs;
  const auto continuous = prefs.get("ContinuousRecording");
  ASSERT_TRUE(continuous);
  ASSERT_NE(continuous->dictionary(), nullptr);
  EXPECT_TRUE(continuous->dictionary()->at("Enabled").asBool());
  EXPECT_EQ(text(prefs.get("TunnelPort")), "8170");
}

TEST_F(PreferenceStore, AWronglyTypedUserValueFallsBackToTheSystems) {
  replace(userFile(), {{"RecordingType", PlistArray{}}});
  replace({{"RecordingType", "Video"}});
  AgentPreferences prefs;
  EXPECT_EQ(text(prefs.get("RecordingType")), "Video");
  EXPECT_EQ(messages().size(), 1U);
}

TEST_F(PreferenceStore, WithoutAHomeTheDomainBeginsAtTheSystemsFile) {
  replace(userFile(), {{"RecordingType", "Audio"}});
  replace({{"RecordingType", "Video"}});
  AgentPreferences prefs;
  unsetenv("HOME");
  EXPECT_EQ(text(prefs.get("RecordingType")), "Video");
  testing::kTestRoot.setHome();
}

TEST_F(PreferenceStore, TheDefaultsAreTheOnesThatNewFilesStartFrom) {
  const PlistDictionary expected{
      {"RecordingType", "Audio+Video"},
      {"RecordingCapturePreset", "Video:Better"},
      {"RecordingCaptureDescription", "50% resolution H.264 Video, Stereo AAC VBR, 44 kHz sample rate"},
      {"RecordingDiskSpaceCutoffInMB", "1024"},
      {"RecordingAudioInput", "Automatic"},
      {"RecordingAudioChannel", "Stereo"},
      {"RecordingAudioSampleRate", "44"},
      {"RecordingVideoInput", "Automatic"},
      {"RecordingVideoMaximumFrameRate", "30"},
      {"RecordingVideoImagePercent", "50"},
      {"PreviewIntervalInMilliseconds", "400"}};
  EXPECT_EQ(adHocDefaults(), expected);
}

}  // namespace
}  // namespace lmx

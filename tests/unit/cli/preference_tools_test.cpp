// Tools that change the preferences file: the preview path and the camera-bind test.
#include "cli/preference_tools.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "cli/bind_command.h"
#include "platform/paths.h"
#include "prefs/adhoc_defaults.h"
#include "prefs/agent_preferences.h"
#include "tests/unit/doubles/scripted_services.h"
#include "tests/unit/doubles/test_root.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::internal::CaptureStderr;
using ::testing::internal::CaptureStdout;
using ::testing::internal::GetCapturedStderr;
using ::testing::internal::GetCapturedStdout;

constexpr const char* kCamera = "11111111-1111-4111-8111-111111111111";
constexpr const char* kServer = "22222222-2222-4222-8222-222222222222";
const std::string kAnswer =
    std::string("Successfully bound ") + kCamera + " to server " + kServer + ".\n";  // 19 + 36 + 11 = 66

class PreferenceTools : public ::testing::Test {
 protected:
  PreferenceTools() { std::filesystem::remove(file()); }
  ~PreferenceTools() override {
    for (const auto& entry : std::filesystem::directory_iterator(directoryOf(file())))
      std::filesystem::remove_all(entry.path());
  }

  static std::string file() { return systemPath(kPreferencesFile); }
  static PlistDictionary stored() {
    const PlistResult read = readPropertyList(file());
    return read && read->dictionary() ? *read->dictionary() : PlistDictionary();
  }
  static std::string text(const PlistDictionary& from, const std::string& key) {
    const auto found = from.find(key);
    return found == from.end() || !found->second.string() ? "(none)" : *found->second.string();
  }
  int bind(const char* path, const char* user, const char* server) {
    CaptureStderr();
    CaptureStdout();
    const int status = bindTestCamera(path, user, server, children_);
    output_ = GetCapturedStdout();
    errors_ = GetCapturedStderr();
    return status;
  }
  void answer(ChildResult::End end, int status, std::string output = {}) {
    children_.result.end = end;
    children_.result.status = status;
    children_.result.output = std::move(output);
  }

  testing::ScriptedChildRunner children_;
  std::string output_;
  std::string errors_;
};

TEST_F(PreferenceTools, PreviewPathGoesIntoNewDefaults) {
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 0);
  PlistDictionary expected = adHocDefaults();
  expected["PreviewPath"] = "/tmp/p.jpg";
  EXPECT_EQ(stored(), expected);
}

TEST_F(PreferenceTools, PreviewPathKeepsOtherSettings) {
  ASSERT_EQ(writePropertyList(file(), PlistDictionary{{"CameraName", "Hall 3"},
                                                      {"Unknown", PlistDictionary{{"a", std::int64_t{1}}}},
                                                      {"PreviewPath", "/old"}}),
            0);
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 0);
  EXPECT_EQ(stored(), (PlistDictionary{{"CameraName", "Hall 3"},
                                       {"Unknown", PlistDictionary{{"a", std::int64_t{1}}}},
                                       {"PreviewPath", "/tmp/p.jpg"}}));
}

TEST_F(PreferenceTools, TheFileStaysXmlWithItsMode) {
  ASSERT_EQ(writePropertyList(file(), PlistDictionary{{"CameraName", "Hall 3"}}), 0);
  ASSERT_EQ(chmod(file().c_str(), 0640), 0);
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 0);
  struct stat status {};
  ASSERT_EQ(stat(file().c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0640U);
  std::ifstream in(file());
  std::string first;
  std::getline(in, first);
  EXPECT_THAT(first, HasSubstr("<?xml"));
}

TEST_F(PreferenceTools, AMalformedFileIsKeptBeforeItIsReplaced) {
  std::ofstream(file()) << "half a file";
  CaptureStderr();
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 0);
  const std::string said = GetCapturedStderr();
  EXPECT_THAT(said, HasSubstr(file() + " can't be used"));
  EXPECT_THAT(said, HasSubstr(file() + ".unreadable-1"));
  std::ifstream in(file() + ".unreadable-1");
  std::string kept;
  std::getline(in, kept);
  EXPECT_EQ(kept, "half a file");
  EXPECT_EQ(text(stored(), "PreviewPath"), "/tmp/p.jpg");

  std::ofstream(file()) << "another";
  CaptureStderr();
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 0);
  EXPECT_THAT(GetCapturedStderr(), HasSubstr(file() + ".unreadable-2"));
}

TEST_F(PreferenceTools, AFileThatCanBeNeitherReadNorKeptIsNotOverwritten) {
  std::filesystem::create_directory(file());
  CaptureStderr();
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 73);
  EXPECT_THAT(GetCapturedStderr(), HasSubstr("nor kept under another name"));
  EXPECT_TRUE(std::filesystem::is_directory(file()));
}

TEST_F(PreferenceTools, AnUnwritableFileReturns73) {
  std::filesystem::remove_all(directoryOf(file()));
  CaptureStderr();
  EXPECT_EQ(setPreviewPath("/tmp/p.jpg"), 73);
  EXPECT_THAT(GetCapturedStderr(), HasSubstr(file() + " could not be written"));
  std::filesystem::create_directories(directoryOf(file()));
}

TEST_F(PreferenceTools, PreviewPathNeedsAPath) {
  for (const char* none : {static_cast<const char*>(nullptr), ""}) {
    CaptureStderr();
    EXPECT_EQ(setPreviewPath(none), 64);
    EXPECT_EQ(GetCapturedStderr(),
              "The -p option requires a file path\nUsage: lmxagentd -p <file-path.jpg>\n");
  }
}

TEST_F(PreferenceTools, BindNamesEachMissingArgument) {
  const std::string usage = "Usage: lmxagentd -t <file-path> -u <username> -c <server>\n";
  EXPECT_EQ(bind(nullptr, nullptr, nullptr), 64);
  EXPECT_EQ(errors_,
            "The -t option requires a file path\n"
            "The -t option requires a username to be specified with the -u option\n"
            "The -t option requires a server to be specified with the -c option\n" +
                usage);
  EXPECT_EQ(bind("/a.mov", "jane", nullptr), 64);
  EXPECT_EQ(errors_, "The -t option requires a server to be specified with the -c option\n" + usage);
  EXPECT_EQ(bind("/a.mov", "", "host"), 64);
  EXPECT_TRUE(children_.runs().empty());
}

TEST_F(PreferenceTools, BindRunsTheToolAndFillsThePreferences) {
  answer(ChildResult::End::exited, 0, "Welcome.\n" + kAnswer);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 0);
  EXPECT_EQ(output_, std::string("camera UUID: ") + kCamera + "\nserver UUID: " + kServer + "\n");
  EXPECT_EQ(errors_, "");
  EXPECT_THAT(children_.runs(), ElementsAre(ElementsAre(systemPath(kLumexTool), "--bind", "Fake-Camera", "-u",
                                                        "jane", "-s", "host")));
  EXPECT_EQ(children_.options().maximumOutput, 264U);
  PlistDictionary expected = adHocDefaults();
  expected["RecordingType"] = "File";
  expected["RecordingPath"] = "/a.mov";
  expected["CameraName"] = "Fake-Camera";
  expected["CameraUUID"] = kCamera;
  expected["ServerUUID"] = kServer;
  expected["RecordingRepositoryPath"] = "/var/lmx/agent/recordings";
  expected["TunnelPort"] = "8175";
  EXPECT_EQ(stored(), expected);
}

TEST_F(PreferenceTools, BindKeepsExistingIdentifiers) {
  const PlistDictionary before{{"CameraName", "Hall"},        {"CameraUUID", "old camera"},
                               {"ServerUUID", "old server"},  {"RecordingRepositoryPath", "/r"},
                               {"TunnelPort", "1"},           {"RecordingType", "Audio"},
                               {"RecordingPath", "/old.mov"}, {"Other", "kept"}};
  ASSERT_EQ(writePropertyList(file(), before), 0);
  answer(ChildResult::End::exited, 0, kAnswer);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 0);
  PlistDictionary expected = before;
  expected["RecordingType"] = "File";
  expected["RecordingPath"] = "/a.mov";
  EXPECT_EQ(stored(), expected);
}

TEST_F(PreferenceTools, AFailingBindToolsStatusIsReturned) {
  answer(ChildResult::End::exited, 5, kAnswer);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 5);
  EXPECT_EQ(errors_, "Error: camera binding failed with exit status 5\n");
  EXPECT_FALSE(std::filesystem::exists(file()));
}

TEST_F(PreferenceTools, AKilledBindToolIsAFailure) {
  answer(ChildResult::End::signalled, 9, kAnswer);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 137);
  EXPECT_EQ(errors_, "Error: camera binding failed with exit status 137\n");
}

TEST_F(PreferenceTools, AMissingBindToolReturnsAShellsStatus) {
  answer(ChildResult::End::notStarted, ENOENT);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 127);
  EXPECT_THAT(errors_, HasSubstr("Error: camera binding failed with exit status 127\n"));
  answer(ChildResult::End::notStarted, EACCES);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 126);
}

TEST_F(PreferenceTools, ABindToolThatCannotBeStartedReturns71) {
  answer(ChildResult::End::notStarted, EAGAIN);
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 71);
  EXPECT_THAT(errors_, HasSubstr("Error: unable to run the `lmx --bind` command\n"));
}

TEST_F(PreferenceTools, AnUnexpectedAnswerReturns76) {
  answer(ChildResult::End::exited, 0, "Bound.\n");
  EXPECT_EQ(bind("/a.mov", "jane", "host"), 76);
  EXPECT_EQ(errors_, "Error: unexpected result from `lmx --bind`: Bound.\n\n");
  EXPECT_FALSE(std::filesystem::exists(file()));
}

TEST(BoundCamera, IsFoundAtFixedPositions) {
  const auto bound = boundCamera("noise " + kAnswer);
  ASSERT_TRUE(bound);
  EXPECT_EQ(bound->cameraUUID, kCamera);
  EXPECT_EQ(bound->serverUUID, kServer);
  const auto other =
      boundCamera("Successfully bound " + std::string(36, 'c') + "xxxxxxxxxxx" + std::string(36, 's'));
  ASSERT_TRUE(other);
  EXPECT_EQ(other->serverUUID, std::string(36, 's'));
}

TEST(BoundCamera, IsAbsentInATruncatedAnswer) {
  EXPECT_FALSE(boundCamera(""));
  EXPECT_FALSE(boundCamera("successfully bound " + std::string(200, 'x')));
  EXPECT_FALSE(boundCamera(kAnswer.substr(0, 66 + 35)));
  EXPECT_TRUE(boundCamera(kAnswer.substr(0, 66 + 36)));
}

TEST(BindCommand, NamesAreSingleWordsWithAnyCharacters) {
  EXPECT_THAT(
      bindCommand("jane doe; rm -rf /", "$(host)"),
      ElementsAre("/usr/bin/lumex", "--bind", "Fake-Camera", "-u", "jane doe; rm -rf /", "-s", "$(host)"));
}

TEST(BindCommand, IsCutAfter255Bytes) {
  // "/usr/bin/lumex --bind Fake-Camera -u " is 37 bytes, " -s " is 4.
  const auto inServer = bindCommand("u", std::string(300, 's'));
  EXPECT_EQ(inServer.back(), std::string(255 - 37 - 1 - 4, 's'));
  const auto inUser = bindCommand(std::string(300, 'u'), "s");
  ASSERT_EQ(inUser.size(), 5U);
  EXPECT_EQ(inUser.back(), std::string(255 - 37, 'u'));
  const auto exact = bindCommand("u", std::string(213, 's'));
  EXPECT_EQ(exact.back(), std::string(213, 's'));
}

}  // namespace
}  // namespace lmx

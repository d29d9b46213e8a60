// Changes the preferences file from the command line.
#include "cli/preference_tools.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "cli/bind_command.h"
#include "model/codes.h"
#include "platform/directories.h"
#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "prefs/adhoc_defaults.h"
#include "prefs/agent_preferences.h"

namespace lmx {
namespace {

constexpr int kShellNotFound = 127;
constexpr int kShellNotExecutable = 126;
constexpr int kShellSignalled = 128;

bool given(const char* argument) { return argument != nullptr && *argument != '\0'; }

/// The current preferences, or the defaults. An unreadable file is first kept under another name.
/// @return nothing when that failed
std::optional<PlistDictionary> loadToChange(const std::string& path) {
  PlistResult file = readPropertyList(path);
  if (file && file->dictionary() != nullptr) return *file->dictionary();
  if (!file && file.error().systemError == ENOENT) return adHocDefaults();
  const std::string problem = file ? "its top level is not a dictionary" : file.error().message;
  const std::string copy = keepUnderAnotherName(path);
  if (copy.empty()) {
    std::fprintf(stderr, "The preferences file %s can't be used (%s) nor kept under another name (%s)\n",
                 path.c_str(), problem.c_str(), std::strerror(errno));
    return std::nullopt;
  }
  std::fprintf(stderr,
               "The preferences file %s can't be used: %s. It is kept as %s; defaults take its place.\n",
               path.c_str(), problem.c_str(), copy.c_str());
  return adHocDefaults();
}

/// @return the exit status
int changePreferences(const PlistDictionary& always, const PlistDictionary& whereAbsent) {
  const std::string path = systemPath(kPreferencesFile);
  auto preferences = loadToChange(path);
  if (!preferences) return exitStatus(ProcessEnd::cannotCreate);
  for (const auto& [key, value] : always) preferences->insert_or_assign(key, value);
  preferences->insert(whereAbsent.begin(), whereAbsent.end());
  if (const int error = writePropertyList(path, std::move(*preferences))) {
    std::fprintf(stderr, "The preferences file %s could not be written: %s\n", path.c_str(),
                 std::strerror(error));
    return exitStatus(ProcessEnd::cannotCreate);
  }
  return 0;
}

/// The exit status in a shell's convention; -1 when the tool could not be run at all.
int shellStatus(const ChildResult& result) {
  switch (result.end) {
    case ChildResult::End::exited:
      return result.status;
    case ChildResult::End::notStarted:
      return result.status == ENOENT ? kShellNotFound : result.status == EACCES ? kShellNotExecutable : -1;
    default:
      return kShellSignalled + result.status;
  }
}

bool allGiven(const char* path, const char* user, const char* server) {
  if (!given(path)) std::fputs("The -t option requires a file path\n", stderr);
  if (!given(user))
    std::fputs("The -t option requires a username to be specified with the -u option\n", stderr);
  if (!given(server))
    std::fputs("The -t option requires a server to be specified with the -c option\n", stderr);
  if (given(path) && given(user) && given(server)) return true;
  std::fputs("Usage: lmxagentd -t <file-path> -u <username> -c <server>\n", stderr);
  return false;
}

/// Runs the tool and prints messages. @return its exit status; `output` receives the beginning of its output
int runBindTool(std::vector<std::string> words, ChildRunner& children, std::string& output) {
  words[0] = systemPath(kLumexTool);
  ChildOptions options;
  options.captureOutput = true;
  options.maximumOutput = kBindOutputLimit;
  ChildResult result = children.run(words, options);
  if (result.end == ChildResult::End::notStarted)
    std::fprintf(stderr, "%s: %s\n", words[0].c_str(), std::strerror(result.status));
  const int status = shellStatus(result);
  if (status < 0) {
    std::fputs("Error: unable to run the `lmx --bind` command\n", stderr);
    return exitStatus(ProcessEnd::operatingSystem);
  }
  if (status != 0) std::fprintf(stderr, "Error: camera binding failed with exit status %d\n", status);
  output = result.output.c_str();  // up to the first NUL
  return status;
}

}  // namespace

int setPreviewPath(const char* path) {
  if (!given(path)) {
    std::fputs("The -p option requires a file path\nUsage: lmxagentd -p <file-path.jpg>\n", stderr);
    return exitStatus(ProcessEnd::usage);
  }
  return changePreferences({{"PreviewPath", std::string(path)}}, {});
}

int bindTestCamera(const char* path, const char* user, const char* server, ChildRunner& children) {
  if (!allGiven(path, user, server)) return exitStatus(ProcessEnd::usage);
  std::string output;
  if (const int status = runBindTool(bindCommand(user, server), children, output)) return status;
  const auto bound = boundCamera(output);
  if (!bound) {
    std::fprintf(stderr, "Error: unexpected result from `lmx --bind`: %s\n", output.c_str());
    return exitStatus(ProcessEnd::protocol);
  }
  std::printf("camera UUID: %s\nserver UUID: %s\n", bound->cameraUUID.c_str(), bound->serverUUID.c_str());
  return changePreferences({{"RecordingType", "File"}, {"RecordingPath", std::string(path)}},
                           {{"CameraName", "Fake-Camera"},
                            {"CameraUUID", bound->cameraUUID},
                            {"ServerUUID", bound->serverUUID},
                            {"RecordingRepositoryPath", "/var/lmx/agent/recordings"},
                            {"TunnelPort", "8175"}});
}

}  // namespace lmx

// The private root directory that prefixes the system's fixed paths in a test program.
#pragma once
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <string>

#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "tests/unit/doubles/temporary_directory.h"

namespace lmx::testing {

/// Created before main, because the program reads the root only once. Removed at the end of the program.
class TestRoot {
 public:
  TestRoot() {
    // The trailing slashes must not show up in paths.
    setenv("LMXAGENTD_ROOT", (path() + "//").c_str(), 1);
    setHome();
    makeFolders();
  }
  [[nodiscard]] const std::string& path() const { return directory_.path(); }
  void setHome() const { setenv("HOME", (path() + "/home").c_str(), 1); }
  /// Removes everything that tests have put there.
  void clear() const {
    for (const auto& entry : std::filesystem::directory_iterator(path())) std::filesystem::remove_all(entry);
    makeFolders();
  }

 private:
  void makeFolders() const {
    for (const char* folder : {"/dev", "/var/run", "/var/lmx/agent/secrets", "/Library/Preferences"}) {
      std::filesystem::create_directories(path() + folder);
    }
  }
  TemporaryDirectory directory_;
};

inline const TestRoot kTestRoot;

/// Preferences of an agent bound to a server, with what a capture needs.
inline PlistDictionary capturePreferences(const std::string& repository) {
  return {{"RecordingType", "Audio+Video"},        {"RecordingRepositoryPath", repository.c_str()},
          {"RecordingDiskSpaceCutoffInMB", "1"},   {"RecordingVideoInput", "camera"},
          {"RecordingAudioInput", "microphone"},   {"RecordingCapturePreset", "Video:Better"},
          {"PreviewIntervalInMilliseconds", "400"}};
}

inline void writePreferences(PlistDictionary preferences) {
  ASSERT_EQ(writePropertyList(systemPath(kPreferencesFile), PlistValue(std::move(preferences))), 0);
}

}  // namespace lmx::testing

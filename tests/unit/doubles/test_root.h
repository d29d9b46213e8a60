// A directory in front of the system's fixed paths, for test programs whose code reads or writes them.
#pragma once
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <memory>
#include <string>

#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "tests/unit/doubles/temporary_directory.h"

namespace lmx::testing {

/// Set up before the first test: the root is read only once by the program.
class TestRoot : public ::testing::Environment {
 public:
  void SetUp() override {
    directory_ = std::make_unique<TemporaryDirectory>();
    ASSERT_EQ(setenv("LMXAGENTD_ROOT", directory_->path().c_str(), 1), 0);
    for (const char* folder : {"/var/run", "/var/lmx/agent/secrets", "/Library/Preferences"}) {
      std::filesystem::create_directories(directory_->path() + folder);
    }
    ASSERT_EQ(systemPath(""), directory_->path()) << "somebody has asked for a path too early";
  }
  void TearDown() override { directory_ = nullptr; }

 private:
  std::unique_ptr<TemporaryDirectory> directory_;
};

inline ::testing::Environment* const kTestRoot = ::testing::AddGlobalTestEnvironment(new TestRoot);

/// Preferences of an agent that is bound to a server, as far as a capture needs them.
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

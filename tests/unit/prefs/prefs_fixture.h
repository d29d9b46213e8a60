// Preferences files for a test, in a directory of their own.
#pragma once
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <vector>

#include "platform/log.h"
#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "prefs/agent_preferences.h"
#include "prefs/steady_reading.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/test_root.h"

namespace lmx::testing {

/// Starts without a preferences file.
class PrefsFixture : public ::testing::Test {
 protected:
  PrefsFixture() {
    kTestRoot.clear();
    failure_ = 0;
    setSettingsReaderForTesting([](const std::string& path) -> PlistResult {
      if (failure_ == 0 || path != failing_path_) return readPropertyList(path);
      return Error{std::strerror(failure_), failure_};
    });
    std::filesystem::create_directories(directoryOf(systemFile()));
    std::filesystem::create_directories(directoryOf(userFile()));
  }
  ~PrefsFixture() override { setSettingsReaderForTesting({}); }

  static std::string systemFile() { return systemPath(kPreferencesFile); }
  static std::string userFile() { return kTestRoot.path() + "/home" + std::string(kPreferencesFile); }

  /// Renames a new file over the old one, as some editors do.
  static void replace(const std::string& path, const PlistDictionary& dictionary) {
    ASSERT_EQ(writePropertyList(path, dictionary), 0);
    makeOld(path);
  }
  static void replace(const PlistDictionary& dictionary) { replace(systemFile(), dictionary); }
  /// Writes to the existing file, as other editors do.
  static void writeInPlace(const std::string& text) {
    std::ofstream(systemFile(), std::ios::in | std::ios::out | std::ios::trunc) << text;
  }
  static void writeText(const std::string& text) {
    std::ofstream(systemFile()) << text;
    makeOld(systemFile());
  }

  /// From now on reading `path` fails with `error`; 0: no longer.
  static void failReading(const std::string& path, int error) {
    failing_path_ = path;
    failure_ = error;
  }

  /// Backdates the file. Timestamps tick slowly, and a later write must get a later one.
  static void makeOld(const std::string& path) {
    std::filesystem::last_write_time(path,
                                     std::filesystem::file_time_type::clock::now() - std::chrono::hours(1));
  }
  static ino_t inodeOf(const std::string& path) {
    struct stat status {};
    return stat(path.c_str(), &status) == 0 ? status.st_ino : 0;
  }

  static std::optional<std::string> text(const std::optional<PlistValue>& value) {
    return value && value->string() != nullptr ? std::optional(*value->string()) : std::nullopt;
  }

  /// What was logged, without debug lines.
  [[nodiscard]] std::vector<LogCapture::Entry> messages() const {
    auto entries = log_.entries();
    std::erase_if(entries, [](const LogCapture::Entry& entry) { return entry.level == kLogDebug; });
    return entries;
  }

  LogCapture log_;

 private:
  static inline std::string failing_path_;
  static inline int failure_ = 0;
};

inline void PrintTo(const LogCapture::Entry& entry, std::ostream* out) {
  *out << entry.level << " " << entry.text;
}

}  // namespace lmx::testing

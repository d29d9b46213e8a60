// The agent's settings: reading, caching, watching and validating the preferences file.
#pragma once
#include <array>
#include <functional>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

#include "capture/api/capture_settings.h"
#include "model/agent_context.h"
#include "platform/file_watcher.h"
#include "platform/plist/property_list.h"
#include "support/recursive_mutex.h"

namespace lmx {

/// Raised by the recording-context builders; name() is always "Preference Error", what() the reason.
class PreferenceError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
  [[nodiscard]] static const char* name() { return "Preference Error"; }
};

/// Thread-safe for reading; the watcher belongs to the main thread.
class AgentPreferences {
 public:
  /// One way of reading a key: getFromPrefsFile or get.
  using Selector = std::optional<PlistValue> (AgentPreferences::*)(const std::string& key);

  /// @param catalog  the capture framework's devices and compressions; may be null for objects that build
  /// nothing
  explicit AgentPreferences(std::shared_ptr<CaptureCatalog> catalog = nullptr);
  ~AgentPreferences();
  AgentPreferences(const AgentPreferences&) = delete;
  AgentPreferences& operator=(const AgentPreferences&) = delete;

  /// The value in the preferences file, through the cache of the whole file. A file that is there but can't
  /// be read as a property list is an error line that names it, once until the cache is reset.
  std::optional<PlistValue> getFromPrefsFile(const std::string& key);
  /// The value in the preferences domain: the user's "~/Library/Preferences/…" file, then the system file,
  /// then the ad-hoc defaults. A text for every key but "ContinuousRecording", which is a dictionary.
  std::optional<PlistValue> get(const std::string& key);

  void setupPrefsFileWatcher();
  /// @return true when the settings must be read again. Never blocks. Main thread.
  bool prefsFileChanged();
  void resetPrefsCache();
  [[nodiscard]] std::optional<PlistDictionary> prefsDict();
  void setPrefsDict(std::optional<PlistDictionary> dictionary);

  /// Reads every setting into `context`; false when a required one is missing or wrong (logged).
  /// Fields before the failing key are already updated then.
  bool setAgentPreferencesInContext(AgentContext& context);
  /// Rewrites the obsolete preview interval in the file, once.
  void migrateOldKeys();

  // Recording types: names and codes.
  static const char* recTypeToString(int code);
  static int recTypeToCode(const char* name);
  static PlistDictionary adHocDefaults();

  /// The capture settings for one recording. Throws PreferenceError; null when continuous capture is
  /// misconfigured.
  static std::shared_ptr<LMRRecordingContext> newRecordingContextForAdHoc(
      std::shared_ptr<CaptureCatalog> catalog);
  static std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemon(
      std::shared_ptr<CaptureCatalog> catalog);
  std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemonWithRecordingType(CaptureType type);
  std::shared_ptr<LMRRecordingContext> newRecordingContextWithSelector(Selector read, CaptureType type);
  CaptureType captureTypeFromString(const std::string& name) const;
  CaptureType captureTypeFromPrefsWithSelector(Selector read);

  /// Print the settings to standard output, through a temporary instance.
  static void dumpDaemon();
  static void dumpAdHoc();
  void dumpWithSelector(Selector read);

  [[noreturn]] void failInvalidCompression(const std::string& key, const std::string& value);
  [[noreturn]] void failInvalidDevice(const std::string& key, const std::string& value);
  [[noreturn]] void failInvalidPreference(const std::string& key, const std::string& value);
  [[noreturn]] void failPreferenceRequired(const std::string& key);

 private:
  /// The preferences domain, the layer that wins first.
  std::array<std::optional<PlistDictionary>, 3> domainLayers();

  std::shared_ptr<CaptureCatalog> catalog_;
  RecursiveMutex prefsCacheMutex_;
  // Guarded by prefsCacheMutex_:
  std::optional<PlistDictionary> prefsDict_;
  bool complained_ = false;       ///< the system file's error line has been written since the last reset
  bool user_complained_ = false;  ///< the user file's
  FileWatcher watcher_;           // main thread only
};

}  // namespace lmx

// Reads, caches and watches the preferences file.
#pragma once
#include <array>
#include <optional>
#include <string>

#include "platform/file_watcher.h"
#include "platform/plist/property_list.h"
#include "support/recursive_mutex.h"

namespace lmx {

/// Reading is thread-safe. The watcher belongs to the main thread.
class AgentPreferences {
 public:
  /// The way to read a key: getFromPrefsFile or get.
  using Selector = std::optional<PlistValue> (AgentPreferences::*)(const std::string& key);

  AgentPreferences();
  AgentPreferences(const AgentPreferences&) = delete;
  AgentPreferences& operator=(const AgentPreferences&) = delete;

  /// The value in the preferences file, read through a cache of the whole file. A file that exists but is not
  /// a readable property list is logged as one error line that names it, once until the cache is reset.
  std::optional<PlistValue> getFromPrefsFile(const std::string& key);
  /// The value in the preferences domain: the user's "~/Library/Preferences/…" file, then the system file,
  /// then the ad-hoc defaults. Every value is a text, except "ContinuousRecording", which is a dictionary.
  std::optional<PlistValue> get(const std::string& key);

  void setupPrefsFileWatcher();
  /// @return true when the settings must be read again. Never blocks. Main thread.
  bool prefsFileChanged();
  void resetPrefsCache();
  /// The cached file; absent when nothing is cached.
  [[nodiscard]] std::optional<PlistDictionary> prefsDict();

  /// Replaces the obsolete preview-interval key in the file, once.
  void migrateOldKeys();

 private:
  /// The layers of the preferences domain, highest priority first.
  std::array<std::optional<PlistDictionary>, 3> domainLayers();

  RecursiveMutex prefsCacheMutex_;
  // Guarded by prefsCacheMutex_:
  std::optional<PlistDictionary> prefsDict_;
  bool complained_ = false;       ///< error line for the system file written since the last reset
  bool user_complained_ = false;  ///< the same for the user's file
  FileWatcher watcher_;           // main thread only
};

/// The text in `value`; absent when `value` is absent or not a text.
std::optional<std::string> textOf(const std::optional<PlistValue>& value);

}  // namespace lmx

// The preferences file: reading, caching and watching it.
#pragma once
#include <array>
#include <optional>
#include <string>

#include "platform/file_watcher.h"
#include "platform/plist/property_list.h"
#include "support/recursive_mutex.h"

namespace lmx {

/// Thread-safe for reading; the watcher belongs to the main thread.
class AgentPreferences {
 public:
  /// One way of reading a key: getFromPrefsFile or get.
  using Selector = std::optional<PlistValue> (AgentPreferences::*)(const std::string& key);

  AgentPreferences();
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
  /// The cached file; absent when nothing is cached.
  [[nodiscard]] std::optional<PlistDictionary> prefsDict();

  /// Rewrites the obsolete preview interval in the file, once.
  void migrateOldKeys();

 private:
  /// The preferences domain, the layer that wins first.
  std::array<std::optional<PlistDictionary>, 3> domainLayers();

  RecursiveMutex prefsCacheMutex_;
  // Guarded by prefsCacheMutex_:
  std::optional<PlistDictionary> prefsDict_;
  bool complained_ = false;       ///< the system file's error line has been written since the last reset
  bool user_complained_ = false;  ///< the user file's
  FileWatcher watcher_;           // main thread only
};

/// The text in `value`; absent when it is absent or no text.
std::optional<std::string> textOf(const std::optional<PlistValue>& value);

}  // namespace lmx

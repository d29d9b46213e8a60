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

  /// The value in the preferences file, read through a cache of the whole file. A file that exists but is no
  /// property list is logged as one error line that names it, once until the cache is reset. A file that
  /// can't be read for a passing reason has the values that were last read from it.
  std::optional<PlistValue> getFromPrefsFile(const std::string& key);
  /// The value in the preferences domain: the user's "~/Library/Preferences/…" file, then the system file,
  /// then the ad-hoc defaults. Every value is a text, except "ContinuousRecording", which is a dictionary.
  std::optional<PlistValue> get(const std::string& key);

  void setupPrefsFileWatcher();
  /// @return true when the settings must be read again: the file has changed, and whyUnreadable() has no
  /// objection. Until then the change is kept for a later call. Main thread.
  bool prefsFileChanged();
  /// The passing reason why the preferences file, or the secret's file that it names, can't be read at
  /// present (logged when it begins and when it is over). Nothing when both can be read, and when one is
  /// absent or malformed. Looks at the preferences file only when nothing is cached.
  std::optional<Error> whyUnreadable();
  void resetPrefsCache();
  /// The cached file; absent when nothing is cached.
  [[nodiscard]] std::optional<PlistDictionary> prefsDict();

  /// Replaces the obsolete preview-interval key in the file, once.
  void migrateOldKeys();

 private:
  bool watchedFileChanged();
  /// Fills the cache unless it is filled. Call it with the lock held.
  void fillCache();
  /// The layers of the preferences domain, highest priority first.
  std::array<std::optional<PlistDictionary>, 3> domainLayers();

  RecursiveMutex prefsCacheMutex_;
  // Guarded by prefsCacheMutex_:
  std::optional<PlistDictionary> prefsDict_;
  bool stale_ = false;            ///< the cache holds what was last read, the file can't be read at present
  bool complained_ = false;       ///< error line for the system file written since the last reset
  bool user_complained_ = false;  ///< the same for the user's file
  // Main thread only:
  FileWatcher watcher_;
  bool unread_change_ = false;  ///< the file has changed, but can't be read yet
};

/// The text in `value`; absent when `value` is absent or not a text.
std::optional<std::string> textOf(const std::optional<PlistValue>& value);

}  // namespace lmx

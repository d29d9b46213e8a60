// Reads, caches and watches the preferences file.
#include "prefs/agent_preferences.h"

#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <mutex>

#include "platform/log.h"
#include "platform/paths.h"
#include "prefs/adhoc_defaults.h"
#include "prefs/shared_secret.h"
#include "prefs/steady_reading.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr const char* kContinuous = "ContinuousRecording";

bool missesSilently(const std::string& key) {
  return key == "RecordingPreviewIntervalInSeconds" || key == "PreviewPath";
}

/// A whole file.
struct Loaded {
  std::optional<PlistDictionary> dictionary;  ///< absent when the file does not exist or can't be used
  bool stale = false;                         ///< it is the one last read; the file can't be read at present
};

/// @param complained  whether an error line has named the file already; set when this writes one
Loaded loadFile(const std::string& path, bool& complained) {
  auto [file, unreadable] = readSteadily(path);
  if (file && file->dictionary() != nullptr) return {*file->dictionary(), unreadable.has_value()};
  if (unreadable || complained || (!file && file.error().systemError == ENOENT)) return {};
  complained = true;
  LMPLogMessage(nullptr, kLogError,
                "The preferences file \"%s\" can't be used: %s. Nothing is read from it; correct it.",
                path.c_str(), file ? "its top level is not a dictionary" : file.error().message.c_str());
  return {};
}

/// A number as decimal text without an exponent; nothing for any other value.
std::optional<std::string> numberText(const PlistValue& value) {
  if (const auto* integer = std::get_if<std::int64_t>(&value.value)) return std::to_string(*integer);
  const auto* real = std::get_if<double>(&value.value);
  if (real == nullptr || !std::isfinite(*real)) return std::nullopt;
  char text[512];  // the largest double has 309 digits, the smallest about 330 decimals
  const auto end = std::to_chars(text, text + sizeof text, *real, std::chars_format::fixed).ptr;
  return std::string(text, end);
}

/// The value, when it has the type that its key requires: a text, or a dictionary for the continuous
/// settings. People often write <integer> and <real>, so numbers are accepted and converted to text.
std::optional<PlistValue> typed(const std::string& key, const PlistValue& value) {
  const bool dictionaryWanted = key == kContinuous;
  if (dictionaryWanted ? value.dictionary() != nullptr : value.string() != nullptr) return value;
  if (!dictionaryWanted) {
    if (auto number = numberText(value)) return std::optional<PlistValue>(std::in_place, std::move(*number));
  }
  LMPLogMessage(nullptr, kLogError,
                "The preference \"%s\" has the wrong type and counts as missing; write it as a <%s>.",
                key.c_str(), dictionaryWanted ? "dict" : "string");
  return std::nullopt;
}

std::string userPreferencesFile() {
  const char* home = std::getenv("HOME");
  return home == nullptr || *home == '\0' ? std::string() : home + std::string(kPreferencesFile);
}

}  // namespace

std::optional<std::string> textOf(const std::optional<PlistValue>& value) {
  if (!value || value->string() == nullptr) return std::nullopt;
  return *value->string();
}

AgentPreferences::AgentPreferences() { setupPrefsFileWatcher(); }

std::optional<PlistDictionary> AgentPreferences::prefsDict() {
  const std::lock_guard lock(prefsCacheMutex_);
  return prefsDict_;
}

void AgentPreferences::resetPrefsCache() {
  const std::lock_guard lock(prefsCacheMutex_);
  prefsDict_ = std::nullopt;
  complained_ = false;
  user_complained_ = false;
}

std::optional<PlistValue> AgentPreferences::getFromPrefsFile(const std::string& key) {
  std::optional<PlistValue> value;
  {
    const std::lock_guard lock(prefsCacheMutex_);
    fillCache();
    if (prefsDict_) {
      const auto found = prefsDict_->find(key);
      if (found != prefsDict_->end()) value = typed(key, found->second);
    }
  }
  if (!value && !missesSilently(key)) {
    LMPLogMessage(nullptr, kLogDebug, "\"%s\" key was not found or value is empty", key.c_str());
  }
  return value;
}

void AgentPreferences::fillCache() {
  if (prefsDict_) return;
  auto [dictionary, stale] = loadFile(systemPath(kPreferencesFile), complained_);
  prefsDict_ = std::move(dictionary);
  stale_ = stale;
}

std::optional<Error> AgentPreferences::whyUnreadable() {
  const std::lock_guard lock(prefsCacheMutex_);
  if (!prefsDict_) {
    auto [file, unreadable] = readSteadily(systemPath(kPreferencesFile));
    if (unreadable) return unreadable;
    if (!file || file->dictionary() == nullptr) return std::nullopt;  // whoever asks for a key logs why
    prefsDict_ = *file->dictionary();
    stale_ = false;
  }
  const auto server = prefsDict_->find("ServerUUID");
  if (server == prefsDict_->end() || server->second.string() == nullptr) return std::nullopt;
  return readSteadily(sharedSecretFile(*server->second.string())).unreadable;
}

std::array<std::optional<PlistDictionary>, 3> AgentPreferences::domainLayers() {
  const std::lock_guard lock(prefsCacheMutex_);
  const std::string user = userPreferencesFile();
  return {user.empty() ? std::nullopt : loadFile(user, user_complained_).dictionary,
          loadFile(systemPath(kPreferencesFile), complained_).dictionary, adHocDefaults()};
}

std::optional<PlistValue> AgentPreferences::get(const std::string& key) {
  for (const auto& layer : domainLayers()) {
    if (!layer) continue;
    const auto found = layer->find(key);
    if (found == layer->end()) continue;
    if (auto value = typed(key, found->second)) return value;
  }
  LMPLogMessage(nullptr, kLogNotice, "Unable to find preference for key: %s", key.c_str());
  return std::nullopt;
}

void AgentPreferences::setupPrefsFileWatcher() {
  resetPrefsCache();
  watcher_.open(systemPath(kPreferencesFile));
}

bool AgentPreferences::prefsFileChanged() {
  if (watchedFileChanged()) unread_change_ = true;
  if (!unread_change_ || whyUnreadable()) return false;
  unread_change_ = false;
  return true;
}

bool AgentPreferences::watchedFileChanged() {
  const std::string path = systemPath(kPreferencesFile);
  const auto exists = [&path] { return access(path.c_str(), F_OK) == 0 || isPassing({{}, errno}); };
  if (!watcher_.isOpen()) {
    if (!exists()) return false;
    setupPrefsFileWatcher();
    return true;
  }
  const FileEvents events = watcher_.poll();
  if (!events.deleted) return events.any();
  if (exists()) {
    setupPrefsFileWatcher();
  } else {
    LMPLogMessage(nullptr, kLogCritical, "The agent preferences file has been deleted");
    resetPrefsCache();
    watcher_.close();
  }
  return true;
}

void AgentPreferences::migrateOldKeys() {
  const std::lock_guard lock(prefsCacheMutex_);  // recursive: the read below locks it again
  const auto old = textOf(getFromPrefsFile("RecordingPreviewIntervalInSeconds"));
  if (!old || !prefsDict_ || stale_) return;
  const auto seconds = static_cast<std::uint32_t>(std::atoi(old->c_str()));
  // The old default of 3 s maps to the new default, not to its equivalent in milliseconds.
  const std::string milliseconds =
      seconds == 3
          ? "400"
          : string_with_format("%lld", static_cast<long long>(static_cast<std::int32_t>(seconds * 1000U)));
  prefsDict_->insert_or_assign("PreviewIntervalInMilliseconds", PlistValue(milliseconds));
  prefsDict_->erase("RecordingPreviewIntervalInSeconds");
  const std::string path = systemPath(kPreferencesFile);
  if (const int error = writePropertyList(path, *prefsDict_)) {
    LMPLogMessage(nullptr, kLogWarning, "The obsolete preview interval could not be replaced in %s: %s",
                  path.c_str(), std::strerror(error));
  }
}

}  // namespace lmx

// Reading, caching and watching the preferences file.
#include "prefs/agent_preferences.h"

#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <mutex>

#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

constexpr const char* kContinuous = "ContinuousRecording";

bool missesSilently(const std::string& key) {
  return key == "RecordingPreviewIntervalInSeconds" || key == "PreviewPath";
}

/// The whole file; nothing, with an error line that names it, when it is there but can't be used.
std::optional<PlistDictionary> loadFile(const std::string& path) {
  PlistResult file = readPropertyList(path);
  if (file.value && file.value->dictionary() != nullptr) return *file.value->dictionary();
  if (file.systemError == ENOENT) return std::nullopt;
  LMPLogMessage(nullptr, kLogError,
                "The preferences file \"%s\" can't be used: %s. Nothing is read from it; correct it.",
                path.c_str(), file.value ? "its top level is not a dictionary" : file.problem.c_str());
  return std::nullopt;
}

/// The value when it has the type its key wants: a text, or for the continuous settings a dictionary. People
/// write <integer> and <true/> by habit: numbers and flags count as their texts.
std::optional<PlistValue> typed(const std::string& key, const PlistValue& value) {
  if (key == kContinuous) {
    if (value.dictionary() != nullptr) return value;
  } else if (value.string() != nullptr) {
    return value;
  } else if (std::holds_alternative<std::int64_t>(value.value)) {
    return PlistValue(std::to_string(value.asInteger()));
  }
  LMPLogMessage(nullptr, kLogError, "The preference \"%s\" is not a %s: it counts as missing", key.c_str(),
                key == kContinuous ? "dictionary" : "string");
  return std::nullopt;
}

std::string userPreferencesFile() {
  const char* home = std::getenv("HOME");
  return home == nullptr || *home == '\0' ? std::string() : home + std::string(kPreferencesFile);
}

}  // namespace

AgentPreferences::AgentPreferences(std::shared_ptr<CaptureCatalog> catalog) : catalog_(std::move(catalog)) {
  setupPrefsFileWatcher();
}

AgentPreferences::~AgentPreferences() = default;

std::optional<PlistDictionary> AgentPreferences::prefsDict() {
  const std::lock_guard lock(prefsCacheMutex_);
  return prefsDict_;
}

void AgentPreferences::setPrefsDict(std::optional<PlistDictionary> dictionary) {
  const std::lock_guard lock(prefsCacheMutex_);
  prefsDict_ = std::move(dictionary);
}

void AgentPreferences::resetPrefsCache() { setPrefsDict(std::nullopt); }

std::optional<PlistValue> AgentPreferences::getFromPrefsFile(const std::string& key) {
  std::optional<PlistValue> value;
  {
    const std::lock_guard lock(prefsCacheMutex_);
    if (!prefsDict_) prefsDict_ = loadFile(systemPath(kPreferencesFile));
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

std::optional<PlistValue> AgentPreferences::get(const std::string& key) {
  const std::optional<PlistDictionary> layers[] = {
      userPreferencesFile().empty() ? std::nullopt : loadFile(userPreferencesFile()),
      loadFile(systemPath(kPreferencesFile)), adHocDefaults()};
  for (const auto& layer : layers) {
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
  const std::string path = systemPath(kPreferencesFile);
  const auto exists = [&path] { return access(path.c_str(), F_OK) == 0; };
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

}  // namespace lmx

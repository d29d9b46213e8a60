// Builds the settings of a capture from the preferences, and refuses those that can't work.
#pragma once
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

#include "capture/api/capture_settings.h"
#include "prefs/agent_preferences.h"

namespace lmx {

/// Raised for preferences that can't be used; name() is always "Preference Error", what() the reason.
class PreferenceError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
  [[nodiscard]] static const char* name() { return "Preference Error"; }
};

/// Builds the capture settings of one recording. One thread.
class RecordingContextBuilder {
 public:
  /// @param read  how each key is read; @param catalog  the devices and compressions to choose from
  RecordingContextBuilder(AgentPreferences& prefs, AgentPreferences::Selector read, CaptureCatalog& catalog)
      : prefs_(prefs), read_(read), catalog_(catalog) {}

  /// "RecordingType" as the capture framework numbers it. Throws PreferenceError.
  CaptureType captureTypeFromPrefs();
  /// The settings for a recording of `type`. Throws PreferenceError.
  /// @return null when continuous capture is misconfigured (logged)
  std::shared_ptr<LMRRecordingContext> newRecordingContext(CaptureType type);

  // Each resets the cache of the preferences, so that the next attempt reads the file afresh.
  [[noreturn]] void failInvalidCompression(const std::string& key, const std::string& value);
  [[noreturn]] void failInvalidDevice(const std::string& key, const std::string& value);
  [[noreturn]] void failInvalidPreference(const std::string& key, const std::string& value);
  [[noreturn]] void failPreferenceRequired(const std::string& key);

 private:
  using Text = std::optional<std::string>;
  [[nodiscard]] Text text(const char* key) { return textOf((prefs_.*read_)(key)); }
  void chooseVideo(LMRRecordingContext& context, const Text& preset);
  void chooseAudio(LMRRecordingContext& context, const Text& preset);
  [[noreturn]] void fail(const std::string& reason);

  AgentPreferences& prefs_;
  const AgentPreferences::Selector read_;
  CaptureCatalog& catalog_;
};

// The settings for one recording, from new preferences. All throw PreferenceError; null when continuous
// capture is misconfigured (logged).
std::shared_ptr<LMRRecordingContext> newRecordingContextForAdHoc(CaptureCatalog& catalog);
std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemon(CaptureCatalog& catalog);
std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemonWithRecordingType(CaptureCatalog& catalog,
                                                                                   CaptureType type);

}  // namespace lmx

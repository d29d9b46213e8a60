// Builds capture settings from the preferences, and rejects those that can't work.
#pragma once
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

#include "capture/api/capture_settings.h"
#include "prefs/agent_preferences.h"

namespace lmx {

/// Raised for unusable preferences. name() is always "Preference Error"; what() gives the reason.
class PreferenceError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
  [[nodiscard]] static const char* name() { return "Preference Error"; }
};

/// Builds the capture settings of one recording. For use on one thread.
class RecordingContextBuilder {
 public:
  /// @param read  how to read each key
  /// @param catalog  the available devices and compressions
  RecordingContextBuilder(AgentPreferences& prefs, AgentPreferences::Selector read, CaptureCatalog& catalog)
      : prefs_(prefs), read_(read), catalog_(catalog) {}

  /// "RecordingType" as the capture framework's number. Throws PreferenceError.
  CaptureType captureTypeFromPrefs();
  /// The settings for a recording of `type`. Throws PreferenceError.
  /// @return null when continuous capture is misconfigured (logged)
  std::shared_ptr<LMRRecordingContext> newRecordingContext(CaptureType type);

  // Each resets the preferences cache, so that the next attempt reads the file again.
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

// The settings for one recording, from newly read preferences. All throw PreferenceError; null when
// continuous capture is misconfigured (logged).
std::shared_ptr<LMRRecordingContext> newRecordingContextForAdHoc(CaptureCatalog& catalog);
std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemon(CaptureCatalog& catalog);
std::shared_ptr<LMRRecordingContext> newRecordingContextForDaemonWithRecordingType(CaptureCatalog& catalog,
                                                                                   CaptureType type);

/// Frames a second at most, from "RecordingVideoMaximumFrameRate": 1 to 240; 30 for anything else.
double maximumFrameRateFrom(const std::optional<std::string>& text);
/// What the preferences file allows a camera, whether or not the rest of it can be used.
PictureLimits pictureLimitsInPrefs();

}  // namespace lmx

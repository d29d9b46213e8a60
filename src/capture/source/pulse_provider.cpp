// Looks for PulseAudio's socket where its library does.
#include "capture/source/pulse_provider.h"

#include <cstdlib>
#include <filesystem>
#include <string>

#include "capture/gst/gst_handles.h"

namespace lmx {
namespace {

bool isThere(const std::string& path) {
  std::error_code problem;
  return std::filesystem::exists(path, problem);
}

bool isThereIn(const char* variable, const std::string& rest) {
  const char* value = std::getenv(variable);
  return value != nullptr && *value != '\0' && isThere(value + rest);
}

/// A server that its configuration alone names is not found.
bool pulseMayBeThere() {
  const char* named = std::getenv("PULSE_SERVER");
  return (named != nullptr && *named != '\0') || isThereIn("PULSE_RUNTIME_PATH", "/native") ||
         isThereIn("XDG_RUNTIME_DIR", "/pulse/native") || isThere("/run/pulse/native");
}

}  // namespace

void askPulseOnlyIfThere() {
  const GstHandle<GstDeviceProviderFactory> pulse(gst_device_provider_factory_find("pulsedeviceprovider"));
  if (!pulse) return;
  gst_plugin_feature_set_rank(GST_PLUGIN_FEATURE(pulse.get()),
                              pulseMayBeThere() ? GST_RANK_PRIMARY : GST_RANK_NONE);
}

}  // namespace lmx

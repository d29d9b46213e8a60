// Switches plug-ins off and on by their ranks; looks for PulseAudio's socket where its library does.
#include "capture/source/device_providers.h"

#include <cstdlib>
#include <filesystem>
#include <map>

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

/// Without a rank it is not asked.
void setAsked(const std::string& provider, bool asked) {
  static auto* ranks = new std::map<std::string, unsigned>;  // their own; never destroyed, as the plug-ins
  const GstHandle<GstDeviceProviderFactory> factory(gst_device_provider_factory_find(provider.c_str()));
  if (!factory) return;
  auto* feature = GST_PLUGIN_FEATURE(factory.get());
  const unsigned rank = ranks->try_emplace(provider, gst_plugin_feature_get_rank(feature)).first->second;
  gst_plugin_feature_set_rank(feature, asked ? rank : static_cast<unsigned>(GST_RANK_NONE));
}

}  // namespace

void chooseProviders(const std::set<std::string>& replaced) {
  setAsked("pipewiredeviceprovider", false);
  setAsked("pulsedeviceprovider", pulseMayBeThere() && !replaced.contains("pulsedeviceprovider"));
  for (const char* provider : {"v4l2deviceprovider", "libcameraprovider"})
    setAsked(provider, !replaced.contains(provider));
}

}  // namespace lmx

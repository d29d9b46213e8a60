// Knows the packages, looks for their elements and loads them.
#include "capture/gst/plugin_packages.h"

#include <algorithm>

#include "capture/gst/gst_handles.h"
#include "platform/log.h"

namespace lmx {
namespace {

struct PluginPackage {
  const char* name;
  int level;
  const char* consequence;
  std::vector<const char*> elements;
  bool load;  ///< whether every recording uses them
};

const std::vector<PluginPackage>& packages() {
  static const char* const kNothing = "nothing can be recorded";
  static const std::vector<PluginPackage> all{
      {"gstreamer1.0-plugins-base",
       kLogError,
       kNothing,
       {"appsrc", "appsink", "decodebin", "uridecodebin", "videoconvert", "videoscale", "audioconvert",
        "audioresample"},
       true},
      {"gstreamer1.0-plugins-good",
       kLogError,
       kNothing,
       {"v4l2src", "jpegdec", "deinterlace", "rtspsrc"},
       true},
      {"gstreamer1.0-plugins-ugly", kLogError, kNothing, {"x264enc"}, true},
      {"gstreamer1.0-libav", kLogError, kNothing, {"avenc_aac", "avdec_h264"}, true},
      {"gstreamer1.0-plugins-bad",
       kLogWarning,
       "network cameras, and others that send H.264, may fail",
       {"h264parse", "h265parse", "tsdemux"},
       false},
      {"gstreamer1.0-alsa",
       kLogWarning,
       "microphones can be used through a sound server only",
       {"alsasrc"},
       false},
      {"gstreamer1.0-pipewire",
       kLogInfo,
       "PipeWire's cameras and microphones can't be used",
       {"pipewiresrc"},
       false}};
  return all;
}

bool canBeMade(const std::string& element) {
  return GstHandle<GstElementFactory>(gst_element_factory_find(element.c_str())) != nullptr;
}

void useOnce(const char* name) {
  GstElement* made = gst_element_factory_make(name, nullptr);
  if (made == nullptr) return;
  gst_object_ref_sink(made);
  const GstHandle<GstElement> element(made);
  // A source would open its device.
  if (GST_OBJECT_FLAG_IS_SET(made, GST_ELEMENT_FLAG_SOURCE)) return;
  gst_element_set_state(made, GST_STATE_READY);
  gst_element_set_state(made, GST_STATE_NULL);
}

}  // namespace

std::vector<MissingPackage> missingPackages(const std::function<bool(const std::string& element)>& isThere) {
  std::vector<MissingPackage> missing;
  for (const PluginPackage& package : packages()) {
    const auto absent = std::find_if_not(package.elements.begin(), package.elements.end(), isThere);
    if (absent != package.elements.end())
      missing.push_back({package.name, *absent, package.consequence, package.level});
  }
  return missing;
}

void loadPlugins() {
  ensureGStreamer();
  for (const MissingPackage& missing : missingPackages(canBeMade)) {
    LMPLogMessage(nullptr, missing.level,
                  "The package %s is missing or incomplete (no GStreamer element %s): %s",
                  missing.package.c_str(), missing.element.c_str(), missing.consequence.c_str());
  }
  for (const PluginPackage& package : packages()) {
    if (package.load) std::for_each(package.elements.begin(), package.elements.end(), useOnce);
  }
}

}  // namespace lmx

// Reads the properties of a node.
#include "capture/source/pipewire_node.h"

#include <algorithm>
#include <string_view>

namespace lmx {
namespace {

std::string property(const PipeWireNode& node, const char* key) {
  const auto found = node.properties.find(key);
  return found == node.properties.end() ? std::string() : found->second;
}

/// Whether one of the parts between slashes is that one.
bool hasPart(std::string_view text, std::string_view part) {
  for (std::size_t begin = 0; begin <= text.size();) {
    const std::size_t end = std::min(text.find('/', begin), text.size());
    if (text.substr(begin, end - begin) == part) return true;
    begin = end + 1;
  }
  return false;
}

}  // namespace

bool goesOneWay(const PipeWireNode& node) { return (node.inputs > 0) != (node.outputs > 0); }

bool isCapture(const PipeWireNode& node, bool video) {
  const std::string kind = property(node, "media.class");
  return hasPart(kind, video ? "Video" : "Audio") && hasPart(kind, "Source");
}

std::string nameOf(const PipeWireNode& node) {
  const std::string description = property(node, "node.description");
  return description.empty() ? "unknown" : description;
}

std::string targetOf(const PipeWireNode& node) {
  const std::string serial = property(node, "object.serial");
  return serial.empty() ? property(node, "node.name") : serial;
}

std::string providerReplacedBy(const PipeWireNode& node) {
  const std::string path = property(node, "object.path");
  if (path.starts_with("v4l2:")) return "v4l2deviceprovider";
  if (path.starts_with("alsa:")) return "pulsedeviceprovider";
  return path.starts_with("libcamera:") ? "libcameraprovider" : std::string();
}

}  // namespace lmx

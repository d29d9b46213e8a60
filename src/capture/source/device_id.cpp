// Parses device identifiers.
#include "capture/source/device_id.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>

namespace lmx {
namespace {

bool startsWith(const std::string& text, const char* prefix) { return text.rfind(prefix, 0) == 0; }

}  // namespace

DeviceID parseDeviceID(const std::string& text) {
  DeviceID id{.text = text, .name = text};
  if (startsWith(text, "v4l2:") || startsWith(text, "alsa:") || startsWith(text, "pipewire:")) {
    id.kind = DeviceKind::hardware;
  } else if (startsWith(text, "file://")) {
    id.kind = DeviceKind::file;
    id.name = text.substr(7);
  } else if (startsWith(text, "rtsp://")) {
    id.kind = DeviceKind::network;
  } else if (startsWith(text, "test://")) {
    id.kind = DeviceKind::test;
    const std::size_t question = text.find('?');
    id.name = text.substr(7, question == std::string::npos ? question : question - 7);
    std::size_t at = question;
    while (at != std::string::npos) {
      const std::size_t next = text.find('&', at + 1);
      const std::string option = text.substr(at + 1, next == std::string::npos ? next : next - at - 1);
      const std::size_t equals = option.find('=');
      if (equals != std::string::npos) id.options[option.substr(0, equals)] = option.substr(equals + 1);
      at = next;
    }
  }
  return id;
}

std::optional<double> DeviceID::seconds(const std::string& option) const {
  const auto found = options.find(option);
  if (found == options.end()) return std::nullopt;
  return std::strtod(found->second.c_str(), nullptr);
}

bool DeviceID::asFastAsPossible() const {
  const auto found = options.find("speed");
  return kind == DeviceKind::test && found != options.end() && found->second == "max";
}

std::optional<FrameRate> syntheticRate(const DeviceID& id) {
  const auto rate = id.seconds("rate");
  if (!rate || !(*rate >= 1 && *rate <= 240)) return std::nullopt;
  return frameRateFrom(*rate);
}

PictureSize pictureSize(const DeviceID& id) {
  PictureSize size;
  const auto found = id.options.find("size");
  if (found != id.options.end()) {
    PictureSize asked;
    if (std::sscanf(found->second.c_str(), "%dx%d", &asked.width, &asked.height) == 2) size = asked;
  }
  size.width = std::clamp(size.width, 64, 4096) & ~1;
  size.height = std::clamp(size.height, 64, 4096) & ~1;
  return size;
}

}  // namespace lmx

// Parses device identifiers.
#include "capture/source/device_id.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <sstream>
#include <string_view>

namespace lmx {
namespace {

constexpr std::string_view kNamedPcm = "device=";

struct Scheme {
  std::string_view prefix;
  DeviceKind kind;
};
constexpr std::array<Scheme, 6> kSchemes{{{"v4l2:", DeviceKind::hardware},
                                          {"alsa:", DeviceKind::hardware},
                                          {"pipewire:", DeviceKind::hardware},
                                          {"file://", DeviceKind::file},
                                          {"rtsp://", DeviceKind::network},
                                          {"test://", DeviceKind::test}}};

/// Cuts "name?key=value&key=value" in two.
void takeOptions(DeviceID& id) {
  const std::size_t question = id.name.find('?');
  if (question == std::string::npos) return;
  std::istringstream options(id.name.substr(question + 1));
  id.name.resize(question);
  for (std::string option; std::getline(options, option, '&');) {
    const std::size_t equals = option.find('=');
    if (equals != std::string::npos) id.options[option.substr(0, equals)] = option.substr(equals + 1);
  }
}

bool nameIsWhole(const DeviceID& id) {
  if (id.name.empty() || id.name == kNamedPcm) return false;
  if (id.kind == DeviceKind::file) return id.name.size() > 1 && id.name.front() == '/';
  return id.kind != DeviceKind::network || (id.name.front() != '/' && id.name.back() != '@');
}

}  // namespace

DeviceID parseDeviceID(const std::string& text) {
  DeviceID id{.text = text, .name = text};
  const auto scheme = std::find_if(kSchemes.begin(), kSchemes.end(),
                                   [&](const Scheme& s) { return text.starts_with(s.prefix); });
  if (scheme == kSchemes.end()) return id;
  id.kind = scheme->kind;
  id.name = text.substr(scheme->prefix.size());
  if (id.kind == DeviceKind::test) takeOptions(id);
  if (!nameIsWhole(id)) id.kind = DeviceKind::unknown;
  return id;
}

std::optional<std::string> DeviceID::alsaName() const {
  if (kind != DeviceKind::hardware || !text.starts_with("alsa:") || !name.starts_with(kNamedPcm))
    return std::nullopt;
  return name.substr(kNamedPcm.size());
}

bool DeviceID::canBeMicrophone() const { return kind != DeviceKind::unknown && !text.starts_with("v4l2:"); }

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

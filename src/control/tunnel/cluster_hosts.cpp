// Member records to addresses.
#include "control/tunnel/cluster_hosts.h"

#include <algorithm>
#include <optional>

namespace lmx {
namespace {

/// A text, or a number as its text; nothing for any other value.
std::optional<std::string> textOf(const PlistDictionary& member, const char* key) {
  const auto found = member.find(key);
  if (found == member.end()) return std::nullopt;
  if (found->second.string() != nullptr) return *found->second.string();
  if (const auto* number = std::get_if<std::int64_t>(&found->second.value)) return std::to_string(*number);
  return std::nullopt;
}

bool isBareV6(const std::string& host) {
  return !host.starts_with('[') && std::count(host.begin(), host.end(), ':') > 1;
}

}  // namespace

std::vector<std::string> clusterHostArray(const PlistDictionary* members) {
  std::vector<std::string> hosts;
  if (members == nullptr) return hosts;
  for (const auto& [key, value] : *members) {
    const PlistDictionary* member = value.dictionary();
    if (member == nullptr) continue;
    const auto host = textOf(*member, "tunnel_agent_host");
    const auto port = textOf(*member, "tunnel_agent_port");
    if (!host || !port) continue;
    std::string entry = (isBareV6(*host) ? "[" + *host + "]" : *host) + ":" + *port;
    if (std::find(hosts.begin(), hosts.end(), entry) == hosts.end()) hosts.push_back(std::move(entry));
  }
  return hosts;
}

}  // namespace lmx

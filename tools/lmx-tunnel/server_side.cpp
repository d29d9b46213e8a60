// Hello, cipher and replies.
#include "tools/lmx-tunnel/server_side.h"

#include <algorithm>
#include <map>
#include <string_view>

#include "control/tunnel/message_cipher.h"
#include "platform/plist/property_list.h"
#include "support/base64.h"
#include "support/heap_ptr.h"

namespace lmx {
namespace {

constexpr std::string_view kPreview = ",preview=";

std::optional<TunnelCipher::Key> keyFrom(const std::string& base64) {
  std::size_t size = 0;
  const heap_ptr<unsigned char> bytes(lmp_decode_base64(base64.c_str(), &size));
  TunnelCipher::Key key{};
  if (!bytes || size != key.size()) return std::nullopt;
  std::copy_n(bytes.get(), size, key.begin());
  return key;
}

std::map<std::string, std::string> fieldsOf(std::string_view text) {
  std::map<std::string, std::string> fields;
  while (!text.empty()) {
    const std::string_view pair = text.substr(0, text.find(','));
    const auto equals = pair.find('=');
    if (equals != std::string_view::npos) fields.emplace(pair.substr(0, equals), pair.substr(equals + 1));
    text.remove_prefix(std::min(pair.size() + 1, text.size()));
  }
  return fields;
}

}  // namespace

std::optional<AgentHello> parseHello(const std::string& line) {
  constexpr std::string_view kVerb = "AGENT ";
  if (!line.starts_with(kVerb)) return std::nullopt;
  auto fields = fieldsOf(std::string_view(line).substr(kVerb.size()));
  const auto vector = keyFrom(fields["iv"]);
  if (fields["protocol"] != "1" || !vector) return std::nullopt;
  return AgentHello{fields["agent_uuid"], fields["version"], *vector,
                    fields["agent_recording_status"] == "offline"};
}

std::optional<std::string> TunnelCipher::encrypted(const std::string& command) const {
  const heap_ptr<unsigned char> random(agent_random_bytes(kRandomPrefix));
  if (!random) return std::nullopt;
  const std::string plaintext =
      std::string(reinterpret_cast<const char*>(random.get()), kRandomPrefix) + command;
  const heap_ptr<char> text(agent_encrypt_message(vector_.data(), secret_.data(), plaintext.data(),
                                                  static_cast<std::uint32_t>(plaintext.size()), nullptr));
  if (!text) return std::nullopt;
  return std::string(text.get()) + "\n";
}

std::optional<std::string> TunnelCipher::decrypted(const std::string& line) const {
  std::uint32_t size = 0;
  const heap_ptr<unsigned char> plaintext(agent_decrypt_message(
      vector_.data(), secret_.data(), line.c_str(), static_cast<std::uint32_t>(line.size()), &size));
  if (!plaintext) return std::nullopt;
  return std::string(reinterpret_cast<const char*>(plaintext.get()) + kRandomPrefix);
}

std::optional<std::string> previewIn(const std::string& reply) {
  const auto found = reply.find(kPreview);
  if (found == std::string::npos) return std::nullopt;
  std::size_t size = 0;
  const heap_ptr<unsigned char> bytes(lmp_decode_base64(reply.c_str() + found + kPreview.size(), &size));
  if (!bytes) return std::nullopt;
  return std::string(reinterpret_cast<const char*>(bytes.get()), size);
}

std::string shortened(const std::string& reply) {
  const auto found = reply.find(kPreview);
  if (found == std::string::npos) return reply;
  return reply.substr(0, found + kPreview.size()) + "(" +
         std::to_string(reply.size() - found - kPreview.size()) + " characters)";
}

bool getsReply(const std::string& command) {
  return !command.starts_with("X-") && !command.starts_with("SERVER") && !command.starts_with("ERR");
}

std::optional<TunnelCipher::Key> readSecret(const std::string& path, std::string& problem) {
  const PlistResult file = readPropertyList(path);
  const PlistDictionary* dictionary = file.value ? file.value->dictionary() : nullptr;
  const auto found =
      dictionary == nullptr ? PlistDictionary::const_iterator{} : dictionary->find("lmx_secret");
  if (dictionary == nullptr || found == dictionary->end() || found->second.string() == nullptr) {
    problem = file.problem.empty() ? "it has no text under \"lmx_secret\"" : file.problem;
    return std::nullopt;
  }
  auto key = keyFrom(*found->second.string());
  if (!key) problem = "the text under \"lmx_secret\" is not the Base64 form of 16 bytes";
  return key;
}

}  // namespace lmx

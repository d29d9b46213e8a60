// Parses hellos, encrypts commands and reads replies.
#include "tools/lmx-tunnel/server_side.h"

#include <algorithm>
#include <map>
#include <string_view>

#include "platform/plist/property_list.h"
#include "support/base64.h"

namespace lmx {
namespace {

constexpr std::string_view kPreview = ",preview=";

std::optional<CipherBlock> keyFrom(const std::string& base64) {
  const auto bytes = lmp_decode_base64(base64);
  CipherBlock key{};
  if (!bytes || bytes->size() != key.size()) return std::nullopt;
  std::copy(bytes->begin(), bytes->end(), key.begin());
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
  const auto text = agent_encrypt_message(vector_, secret_, agent_random_bytes(kRandomPrefix) + command);
  if (!text) return std::nullopt;
  return *text + "\n";
}

std::optional<std::string> TunnelCipher::decrypted(const std::string& line) const {
  const auto plaintext = agent_decrypt_message(vector_, secret_, line);
  if (!plaintext) return std::nullopt;
  return messageIn(*plaintext);
}

std::optional<std::string> previewIn(const std::string& reply) {
  const auto found = reply.find(kPreview);
  if (found == std::string::npos) return std::nullopt;
  return lmp_decode_base64(std::string_view(reply).substr(found + kPreview.size()));
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

Result<CipherBlock> readSecret(const std::string& path) {
  const PlistResult file = readPropertyList(path);
  const std::string* text = file ? file->textUnder("lmx_secret") : nullptr;
  if (text == nullptr) return file ? Error{"it has no text under \"lmx_secret\""} : file.error();
  const auto key = keyFrom(*text);
  if (!key) return Error{"the text under \"lmx_secret\" is not the Base64 form of 16 bytes"};
  return *key;
}

}  // namespace lmx

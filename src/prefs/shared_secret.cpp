// Reads the secret's property list.
#include "prefs/shared_secret.h"

#include <algorithm>
#include <string_view>

#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "prefs/steady_reading.h"
#include "support/base64.h"

namespace lmx {
namespace {

std::string_view trimmed(std::string_view text) {
  constexpr std::string_view kWhiteSpace = " \t\r\n";
  const auto first = text.find_first_not_of(kWhiteSpace);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kWhiteSpace) - first + 1);
}

SecretError unusable(const std::string& path, const std::string& reason) {
  return {SecretError::Kind::unusable, "The shared secret in \"" + path + "\" can't be used: " + reason};
}

}  // namespace

std::string sharedSecretFile(const std::string& server_uuid) {
  return systemPath(kSecretsDirectory) + "/" + server_uuid + ".plist";
}

Result<ServerSettings::Secret, SecretError> readSharedSecret(const std::string& server_uuid) {
  const std::string path = sharedSecretFile(server_uuid);
  const PlistResult file = readSteadily(path).file;
  const std::string* text = file ? file->textUnder("lmx_secret") : nullptr;
  if (text == nullptr) {
    return SecretError{SecretError::Kind::missing, "Failed to read shared secret from plist: " + path};
  }
  const auto bytes = lmp_decode_base64(trimmed(*text));
  if (!bytes) return unusable(path, "\"lmx_secret\" is not Base64 text");
  ServerSettings::Secret secret{};
  if (bytes->size() != secret.size()) {
    return unusable(path, "\"lmx_secret\" has " + std::to_string(bytes->size()) + " bytes instead of " +
                              std::to_string(secret.size()));
  }
  std::copy(bytes->begin(), bytes->end(), secret.begin());
  return secret;
}

}  // namespace lmx

// Reads the secret's property list.
#include "prefs/shared_secret.h"

#include <algorithm>

#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "support/base64.h"

namespace lmx {

Result<ServerSettings::Secret> readSharedSecret(const std::string& server_uuid) {
  const std::string path = systemPath(kSecretsDirectory) + "/" + server_uuid + ".plist";
  const PlistResult file = readPropertyList(path);
  const std::string* text = file ? file->textUnder("lmx_secret") : nullptr;
  if (text == nullptr) return Error{"Failed to read shared secret from plist: " + path};
  const auto bytes = lmp_decode_base64(*text);
  ServerSettings::Secret secret{};
  if (!bytes || bytes->size() != secret.size()) return Error{};
  std::copy(bytes->begin(), bytes->end(), secret.begin());
  return secret;
}

}  // namespace lmx

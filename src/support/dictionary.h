// The string-to-string dictionary that holds the parameters of commands, properties and metadata.
#pragma once
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

using Dictionary = std::map<std::string, std::string, std::less<>>;
/// Shared between threads. Replaced, never edited in place. Null means none.
using SharedDictionary = std::shared_ptr<const Dictionary>;

/// The value for `key`, or nothing when the dictionary or the key is absent.
inline std::optional<std::string> lookUp(const Dictionary* dictionary, std::string_view key) {
  if (dictionary == nullptr) return std::nullopt;
  const auto found = dictionary->find(key);
  if (found == dictionary->end()) return std::nullopt;
  return found->second;
}
inline std::optional<std::string> lookUp(const SharedDictionary& dictionary, std::string_view key) {
  return lookUp(dictionary.get(), key);
}

}  // namespace lmx

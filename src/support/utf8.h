// UTF-8 (RFC 3629), and which of its characters XML 1.0 allows.
#pragma once
#include <cstddef>
#include <string>
#include <string_view>

namespace lmx {

/// Length in bytes of the first character of `text`; 0 when `text` is empty or malformed there (including
/// overlong forms, surrogates and anything above U+10FFFF).
std::size_t utf8CharacterLength(std::string_view text);

/// The same, but also 0 for a character that XML does not allow, not even escaped.
std::size_t xmlCharacterLength(std::string_view text);

/// Whether all of `text` is well-formed.
bool isUtf8(std::string_view text);

/// Replaces each byte that XML can't represent with `substitute`: one stray byte in a title must not make a
/// whole document unreadable.
std::string xmlText(std::string_view text, std::string_view substitute);

}  // namespace lmx

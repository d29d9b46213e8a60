// UTF-8 (RFC 3629) and which of its characters XML 1.0 can hold.
#pragma once
#include <cstddef>
#include <string>
#include <string_view>

namespace lmx {

/// Bytes of the character that `text` begins with; 0 when it is empty or malformed there (overlong forms,
/// surrogates and anything above U+10FFFF included).
std::size_t utf8CharacterLength(std::string_view text);

/// The same, and 0 too for a character that XML can't hold, escaped or not.
std::size_t xmlCharacterLength(std::string_view text);

/// Whether all of `text` is well-formed.
bool isUtf8(std::string_view text);

/// Characters (not bytes) of a UTF-8 text.
std::size_t characterCount(std::string_view utf8);

/// `text` with `substitute` for each byte that XML can't hold: one stray byte in a title must not make a
/// whole document unreadable.
std::string xmlText(std::string_view text, std::string_view substitute);

}  // namespace lmx

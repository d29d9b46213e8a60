// Checks the size and form of property lists before libplist parses them, which has no limits of its own.
// Pure.
#pragma once
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// An XML document reduced to what a property list may contain, or the reason why it is rejected.
struct XmlCheck {
  std::string clean;  ///< bare tags and their text: no comments, CDATA, attributes or DOCTYPE
  std::optional<std::string> refused;  ///< depth, number of values, definitions, unbalanced or unknown tags
};

/// The parser gets `clean` instead of the document. Otherwise something that it reads differently (the end of
/// a comment, a quoted bracket) could bypass the limits.
/// @param values  highest number of values allowed
XmlCheck checkXml(std::string_view text, std::size_t values);

/// Why a binary property list must not be parsed: malformed tables, circular references, depth, or too many
/// values or bytes (counted as often as they expand). Nothing when it may be parsed.
std::optional<std::string> refuseBinary(std::string_view bytes, std::size_t values);

/// U+FFFD replaces characters that a property list's XML can't represent.
inline constexpr std::string_view kReplacementCharacter = "\xEF\xBF\xBD";

}  // namespace lmx

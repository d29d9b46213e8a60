// Bounds on XML property lists, checked before a library sees them: it has none of its own. Pure.
#pragma once
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// An XML document reduced to what a property list may hold, or why it is refused.
struct XmlCheck {
  std::string clean;                   ///< bare tags and their text: no comment, CDATA, attribute or DOCTYPE
  std::optional<std::string> refused;  ///< depth, number of values, definitions, unbalanced or unknown tags
};

/// The parser gets `clean` instead of the document, so that nothing that it reads differently (a comment's
/// end, a quoted bracket) can get past the bounds counted here.
/// @param values  the most values that it may hold
XmlCheck checkXml(std::string_view text, std::size_t values);

/// Stands for what a property list's XML can't hold: U+FFFD.
inline constexpr std::string_view kReplacementCharacter = "\xEF\xBF\xBD";

}  // namespace lmx

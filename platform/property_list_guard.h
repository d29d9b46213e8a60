// Bounds on property lists, checked before a library sees them: it has none of its own. Pure.
#pragma once
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// Why an XML document must not be parsed (depth, number of elements, a DOCTYPE with definitions); nothing
/// when it may.
std::optional<std::string> refuseXml(std::string_view text);

/// The same for a binary property list: malformed tables, references in a circle, depth, nodes as often as
/// they expand.
std::optional<std::string> refuseBinary(std::string_view bytes);

}  // namespace lmx

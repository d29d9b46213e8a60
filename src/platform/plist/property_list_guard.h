// Bounds on binary property lists, checked before a library sees them: it has none of its own. Pure.
#pragma once
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// Why a binary property list must not be parsed (malformed tables, references in a circle, depth, values and
/// bytes counted as often as they expand); nothing when it may.
/// @param values  the most values that it may hold
std::optional<std::string> refuseBinary(std::string_view bytes, std::size_t values);

}  // namespace lmx

// Unique identifiers.
#pragma once
#include <string>

namespace lmx {

/// A new random UUID in canonical upper-case text (RFC 4122, version 4). Thread-safe.
std::string newUUIDString();

}  // namespace lmx

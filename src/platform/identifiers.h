// Generates unique identifiers.
#pragma once
#include <string>

namespace lmx {

/// A new random UUID (RFC 4122, version 4) as upper-case canonical text. Thread-safe.
std::string newUUIDString();

}  // namespace lmx

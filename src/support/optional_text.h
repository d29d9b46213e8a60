// Texts that may be absent, as people read them.
#pragma once
#include <optional>
#include <string>

namespace lmx {

/// What stands for an absent text in log lines and in the hello.
inline constexpr const char* kAbsentText = "(null)";

/// `text`, or the sign of its absence.
inline std::string orAbsent(const std::optional<std::string>& text) { return text.value_or(kAbsentText); }

}  // namespace lmx

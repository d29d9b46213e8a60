// Small text rules of the command protocol: what is trimmed, what is hidden from the log.
#pragma once
#include <string>
#include <string_view>

namespace lmx {

/// `text` without the line breaks at both ends: line feed, vertical tab, form feed, carriage return and the
/// UTF-8 forms of U+0085, U+2028 and U+2029.
std::string_view trimLineBreaks(std::string_view text);

/// `command` for the log: the value of every RecordingMetadata_AGENT_PASSWORD is replaced by stars.
std::string withoutSecrets(std::string_view command);

}  // namespace lmx

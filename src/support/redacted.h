// Takes the user names and passwords out of the addresses in a text, before people read it.
#pragma once
#include <string>
#include <string_view>

namespace lmx {

/// `text` with what stands before the host in each address, "scheme://user:password@" or "scheme://user@",
/// replaced by "scheme://***@"; anything else stays as it is. White space ends an address. A password may
/// hold "/", "?", "#" and "@" unescaped, as people type them; where that is ambiguous, rather too much
/// becomes stars. Pure.
std::string redacted(std::string_view text);

}  // namespace lmx

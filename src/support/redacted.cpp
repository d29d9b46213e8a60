// Finds addresses in a text and replaces what they say before the host.
#include "support/redacted.h"

#include <algorithm>

namespace lmx {
namespace {

constexpr std::string_view kMark = "://";

bool isSpace(char c) { return static_cast<unsigned char>(c) <= ' '; }

bool isSchemeLetter(char c) {
  const bool letter = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
  return letter || (c >= '0' && c <= '9') || c == '+' || c == '-' || c == '.';
}

/// Where the scheme before the mark at `mark` begins, not before `from`; `mark` itself when there is none.
std::size_t schemeBefore(std::string_view text, std::size_t mark, std::size_t from) {
  std::size_t at = mark;
  while (at > from && isSchemeLetter(text[at - 1])) --at;
  return at;
}

/// What follows a scheme up to white space or to the next address.
std::string_view restOfAddress(std::string_view text, std::size_t begin) {
  const std::size_t next = text.find(kMark, begin);
  const std::size_t limit = next == std::string_view::npos ? text.size() : schemeBefore(text, next, begin);
  const std::string_view rest = text.substr(begin, limit - begin);
  const auto end = std::find_if(rest.begin(), rest.end(), isSpace);
  return rest.substr(0, static_cast<std::size_t>(end - rest.begin()));
}

/// How many characters of `address` (without its scheme) are user and password, without the "@" that ends
/// them.
std::size_t lengthOfCredentials(std::string_view address) {
  const std::size_t authority = std::min(address.find_first_of("/?#"), address.size());
  const std::size_t in_authority = address.substr(0, authority).rfind('@');
  // A colon before the first "/" may be that of a password with a "/" in it; the last "@" then ends the
  // password. After a bracket it is part of a numeric host.
  const bool colon = address.substr(0, authority).find(':') != std::string_view::npos;
  const bool numeric_host = address.starts_with('[') && in_authority == std::string_view::npos;
  const std::size_t at = colon && !numeric_host ? address.rfind('@') : in_authority;
  return at == std::string_view::npos ? 0 : at;
}

}  // namespace

std::string redacted(std::string_view text) {
  std::string out;
  std::size_t copied = 0;
  for (std::size_t mark = text.find(kMark); mark != std::string_view::npos;) {
    const std::size_t begin = mark + kMark.size();
    const std::size_t credentials =
        schemeBefore(text, mark, copied) < mark ? lengthOfCredentials(restOfAddress(text, begin)) : 0;
    if (credentials > 0) {
      out.append(text.substr(copied, begin - copied)).append("***");
      copied = begin + credentials;
    }
    mark = text.find(kMark, begin + credentials);
  }
  return out.append(text.substr(copied));
}

}  // namespace lmx

// Reads property lists in XML or binary form within limits, and writes them as XML.
#pragma once
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "support/result.h"

namespace lmx {

struct PlistValue;
using PlistArray = std::vector<PlistValue>;
using PlistDictionary = std::map<std::string, PlistValue, std::less<>>;

/// A date in whole seconds since 2001-01-01 UTC.
struct PlistDate {
  double secondsSinceReferenceDate = 0;
  bool operator==(const PlistDate&) const = default;
};
struct PlistValue {
  using Data = std::vector<std::uint8_t>;
  std::variant<std::string, bool, std::int64_t, double, PlistDate, Data, PlistArray, PlistDictionary> value;

  PlistValue() = default;
  PlistValue(const char* text) : value(std::string(text)) {}
  template <class T>
  PlistValue(T v) : value(std::move(v)) {}  // NOLINT: implicit, so that values can be written inline
  bool operator==(const PlistValue&) const = default;

  [[nodiscard]] const std::string* string() const { return std::get_if<std::string>(&value); }
  [[nodiscard]] const PlistDictionary* dictionary() const { return std::get_if<PlistDictionary>(&value); }
  /// The value under `key`; null when this is not a dictionary or has no such key.
  [[nodiscard]] const PlistValue* under(std::string_view key) const;
  /// The text under `key`; null when there is no text.
  [[nodiscard]] const std::string* textUnder(std::string_view key) const;
  /// Conversions as in a preferences store: numbers and booleans convert to one another, texts are read as by
  /// strtod/atoll ("true"/"yes" are 1 for asBool), anything else is 0.
  [[nodiscard]] double asReal() const;
  [[nodiscard]] std::int64_t asInteger() const;
  [[nodiscard]] bool asBool() const;
};

inline constexpr std::size_t kPlistFileLimit = 256U << 10;
inline constexpr int kPlistDepthLimit = 64;
inline constexpr std::size_t kPlistNodeLimit = 10000;

/// Limits on a document. The defaults suit files written by hand.
struct PlistLimits {
  std::size_t bytes = kPlistFileLimit;
  std::size_t values = kPlistNodeLimit;
};

/// Why there is no value, in words; with the errno when the file couldn't be read (ENOENT: no such file).
using PlistResult = Result<PlistValue>;

/// Parses XML or binary bytes. Skips a byte order mark. Rejects, before libplist sees them: more than
/// kPlistDepthLimit levels, more than `limits.values` values (shared references of the binary form count as
/// often as they expand), and self-references. Never throws.
PlistResult parsePropertyList(const std::string& bytes, PlistLimits limits = {});

/// Reads and parses a file of at most `limits.bytes` bytes. Accepts regular files only; never blocks on a
/// FIFO.
PlistResult readPropertyList(const std::string& path, PlistLimits limits = {});

/// `value` as XML with declaration and DOCTYPE, ending in a line feed.
std::string propertyListXml(const PlistValue& value);

/// Writes `value` atomically (see writeFileAtomically). @return 0 or the errno
int writePropertyList(const std::string& path, const PlistValue& value, unsigned mode = 0644);

}  // namespace lmx

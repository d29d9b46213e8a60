// Reducing an XML document to the bare tags of a property list, and counting them.
#include "platform/plist/property_list_xml.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <charconv>
#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

#include "platform/plist/property_list.h"
#include "support/utf8.h"

namespace lmx {
namespace {

constexpr std::array<std::string_view, 3> kContainers{"plist", "dict", "array"};
constexpr std::array<std::string_view, 6> kTexts{"key", "string", "integer", "real", "date", "data"};
constexpr std::array<std::string_view, 2> kBooleans{"true", "false"};

template <std::size_t n>
bool isOneOf(const std::array<std::string_view, n>& names, std::string_view name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

std::string tagOf(std::string_view name, std::string_view begin = "<") {
  std::string tag(begin);
  tag += name;
  tag += '>';
  return tag;
}

void appendEscaped(std::string& out, std::string_view text) {
  for (const char c : text) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      default:
        out += c;
    }
  }
}

void appendUtf8(std::string& out, std::uint32_t character) {
  const auto tail = [&](unsigned shift) { out += static_cast<char>(0x80U | (character >> shift & 0x3FU)); };
  if (character < 0x80) {
    out += static_cast<char>(character);
  } else if (character < 0x800) {
    out += static_cast<char>(0xC0U | character >> 6U);
    tail(0);
  } else if (character < 0x10000) {
    out += static_cast<char>(0xE0U | character >> 12U);
    tail(6);
    tail(0);
  } else {
    out += static_cast<char>(0xF0U | character >> 18U);
    tail(12);
    tail(6);
    tail(0);
  }
}

/// The character for a reference such as "#65" or "#x41" (the part between "&" and ";"); nothing when XML
/// does not allow that character.
std::optional<std::string> referredCharacter(std::string_view reference) {
  reference.remove_prefix(1);
  const bool hexadecimal = reference.starts_with('x');
  if (hexadecimal) reference.remove_prefix(1);
  std::uint32_t character = 0;
  const char* const end = reference.data() + reference.size();
  const auto parsed = std::from_chars(reference.data(), end, character, hexadecimal ? 16 : 10);
  if (parsed.ec != std::errc() || parsed.ptr != end || character > 0x10FFFF) return std::nullopt;
  std::string text;
  appendUtf8(text, character);
  if (xmlCharacterLength(text) == 0) return std::nullopt;
  return text;
}

class XmlReducer {
 public:
  XmlReducer(std::string_view text, std::size_t most) : rest_(text), most_(most) {}

  XmlCheck run() {
    if (rest_.find('\0') != std::string_view::npos) fail("a NUL character");
    while (!check_.refused && !rest_.empty()) step();
    if (!check_.refused && !open_.empty()) fail(tagOf(open_.back()) + " that does not end");
    return std::move(check_);
  }

 private:
  void fail(std::string problem) { check_.refused = std::move(problem); }
  [[nodiscard]] bool inText() const { return !open_.empty() && isOneOf(kTexts, open_.back()); }

  void step() {
    if (rest_.front() != '<') return takeText();
    if (rest_.starts_with("<!--")) return (void)takeUntil("-->", 4);
    if (rest_.starts_with("<?")) return (void)takeUntil("?>", 2);
    if (rest_.starts_with("<![CDATA[")) return takeCharacterData();
    if (rest_.starts_with("<!DOCTYPE")) return takeDoctype();
    if (rest_.starts_with("<!")) return fail("a definition");
    takeTag();
  }

  /// Text between values must be white space.
  void takeText() {
    const std::string_view text = rest_.substr(0, rest_.find('<'));
    rest_.remove_prefix(text.size());
    if (inText()) addText(text);
  }

  /// Resolves character references here, because libplist aborts on some of them (NUL).
  void addText(std::string_view text) {
    for (;;) {
      const std::size_t at = text.find("&#");
      check_.clean += text.substr(0, at);
      if (at == std::string_view::npos) return;
      const std::size_t end = text.find(';', at);
      const auto character =
          end == std::string_view::npos ? std::nullopt : referredCharacter(text.substr(at + 1, end - at - 1));
      if (!character) return fail("a reference to a character that is none");
      appendEscaped(check_.clean, *character);
      text.remove_prefix(end + 1);
    }
  }

  /// Skips `skip` characters. @return the text up to `end`
  std::string_view takeUntil(std::string_view end, std::size_t skip) {
    const std::size_t at = rest_.find(end, skip);
    if (at == std::string_view::npos) {
      fail("markup that does not end");
      return {};
    }
    const std::string_view inner = rest_.substr(skip, at - skip);
    rest_.remove_prefix(at + end.size());
    return inner;
  }

  void takeCharacterData() {
    const std::string_view text = takeUntil("]]>", 9);
    if (inText()) appendEscaped(check_.clean, text);
  }

  /// The contents of a tag up to its ">". A ">" in a quoted value does not end it.
  std::string_view takeMarkup() {
    char quote = '\0';
    for (std::size_t i = 1; i < rest_.size(); ++i) {
      const char c = rest_[i];
      if (quote != '\0') {
        if (c == quote) quote = '\0';
      } else if (c == '"' || c == '\'') {
        quote = c;
      } else if (c == '<') {
        break;
      } else if (c == '>') {
        const std::string_view inner = rest_.substr(1, i - 1);
        rest_.remove_prefix(i + 1);
        return inner;
      }
    }
    fail("a tag that does not end");
    return {};
  }

  void takeDoctype() {
    // An internal subset may define entities that expand without limit. No property list needs one.
    const std::size_t end = rest_.find('>');
    if (rest_.substr(0, end).find('[') != std::string_view::npos) return fail("a DOCTYPE with definitions");
    (void)takeMarkup();
  }

  void takeTag() {
    std::string_view inner = takeMarkup();
    if (check_.refused) return;
    const bool closing = inner.starts_with('/');
    if (closing) inner.remove_prefix(1);
    const bool empty = !closing && inner.ends_with('/');
    if (empty) inner.remove_suffix(1);
    const auto* const end = std::find_if(inner.begin(), inner.end(),
                                         [](char c) { return std::isspace(static_cast<unsigned char>(c)); });
    const std::string_view name(inner.begin(), end);
    if (!isOneOf(kContainers, name) && !isOneOf(kTexts, name) && !isOneOf(kBooleans, name)) {
      return fail("an unknown element " + tagOf(xmlText(name.substr(0, 32), kReplacementCharacter)));
    }
    if (closing) return close(name);
    open(name);
    if (empty && !check_.refused) close(name);
  }

  void open(std::string_view name) {
    if (!open_.empty() && !isOneOf(kContainers, open_.back())) {
      return fail("an element inside of " + tagOf(open_.back()));
    }
    if (name == "plist" && !open_.empty()) return fail("a <plist> inside of the document");
    open_.push_back(name);
    const auto levels = open_.size() - (open_.front() == "plist" ? 1 : 0);
    if (levels > kPlistDepthLimit)
      return fail("nested more than " + std::to_string(kPlistDepthLimit) + " levels");
    if (name != "plist" && name != "key" && ++values_ > most_) {
      return fail("more than " + std::to_string(most_) + " values");
    }
    check_.clean += '<';
    check_.clean += name;
    check_.clean += isOneOf(kBooleans, name) ? "/>" : ">";
  }

  void close(std::string_view name) {
    if (open_.empty() || open_.back() != name) return fail(tagOf(name, "</") + " without its beginning");
    open_.pop_back();
    if (isOneOf(kBooleans, name)) return;
    check_.clean += "</";
    check_.clean += name;
    check_.clean += '>';
  }

  std::string_view rest_;
  std::size_t most_;
  std::vector<std::string_view> open_;
  std::size_t values_ = 0;
  XmlCheck check_;
};

}  // namespace

XmlCheck checkXml(std::string_view text, std::size_t values) { return XmlReducer(text, values).run(); }

}  // namespace lmx

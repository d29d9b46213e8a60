// Walking property lists to measure them.
#include "platform/property_list_guard.h"

#include <cstdint>
#include <set>
#include <vector>

#include "platform/property_list.h"

namespace lmx {
namespace {

std::string tooDeep() { return "nested more than " + std::to_string(kPlistDepthLimit) + " levels"; }
std::string tooMany() { return "more than " + std::to_string(kPlistNodeLimit) + " values"; }

/// The end of the tag that starts at `at`: behind its ">", quoted attribute values skipped.
std::size_t endOfTag(std::string_view text, std::size_t at) {
  char quote = '\0';
  for (; at < text.size(); ++at) {
    if (quote != '\0') {
      if (text[at] == quote) quote = '\0';
    } else if (text[at] == '"' || text[at] == '\'') {
      quote = text[at];
    } else if (text[at] == '>') {
      return at + 1;
    }
  }
  return std::string_view::npos;
}

std::size_t behind(std::string_view text, std::size_t at, std::string_view terminator) {
  const std::size_t end = text.find(terminator, at);
  return end == std::string_view::npos ? end : end + terminator.size();
}

/// The binary form's tables.
class BinaryWalk {
 public:
  explicit BinaryWalk(std::string_view bytes) : bytes_(bytes) {}

  std::optional<std::string> check() {
    if (bytes_.size() < 40) return "too short for a binary property list";
    const std::size_t trailer = bytes_.size() - 32;
    offset_size_ = byte(trailer + 6);
    reference_size_ = byte(trailer + 7);
    objects_ = number(trailer + 8, 8);
    const std::uint64_t top = number(trailer + 16, 8);
    table_ = number(trailer + 24, 8);
    if (offset_size_ < 1 || offset_size_ > 8 || reference_size_ < 1 || reference_size_ > 8 || objects_ == 0 ||
        objects_ > bytes_.size() || table_ > trailer || objects_ * offset_size_ > trailer - table_ ||
        top >= objects_) {
      return "malformed binary property list";
    }
    walk(top, 0);
    return problem_;
  }

 private:
  [[nodiscard]] unsigned byte(std::uint64_t at) const { return static_cast<unsigned char>(bytes_[at]); }
  [[nodiscard]] std::uint64_t number(std::uint64_t at, unsigned size) const {
    std::uint64_t value = 0;
    for (unsigned i = 0; i < size; ++i) value = value << 8 | byte(at + i);
    return value;
  }

  void fail(std::string problem) {
    if (!problem_) problem_ = std::move(problem);
  }

  /// Reads the element count behind a marker. @return false when it does not fit.
  bool readCount(std::uint64_t& at, std::uint64_t& count) {
    count = byte(at) & 0x0FU;
    ++at;
    if (count != 0x0F) return true;
    if (at >= table_) return false;
    const unsigned size = 1U << (byte(at) & 0x0FU);
    if ((byte(at) & 0xF0U) != 0x10 || size > 8 || at + 1 + size > table_) return false;
    count = number(at + 1, size);
    at += 1 + size;
    return true;
  }

  void walk(std::uint64_t object, int depth) {
    if (problem_) return;
    if (depth > kPlistDepthLimit) return fail(tooDeep());
    if (++nodes_ > kPlistNodeLimit) return fail(tooMany());
    std::uint64_t at = number(table_ + object * offset_size_, offset_size_);
    if (at < 8 || at >= table_) return fail("malformed binary property list");
    const unsigned kind = byte(at) & 0xF0U;
    std::uint64_t count = 0;
    if (kind == 0xA0 || kind == 0xC0 || kind == 0xD0) {
      if (!readCount(at, count)) return fail("malformed binary property list");
      const std::uint64_t references = kind == 0xD0 ? count * 2 : count;
      if (count > bytes_.size() || references * reference_size_ > table_ - at) {
        return fail("malformed binary property list");
      }
      walkChildren(object, at, references, depth);
    } else if (kind == 0x40 || kind == 0x50 || kind == 0x60) {
      const unsigned unit = kind == 0x60 ? 2 : 1;
      if (!readCount(at, count) || count > bytes_.size() || count * unit > table_ - at) {
        fail("malformed binary property list");
      }
    } else if (kind == 0x10 || kind == 0x20 || kind == 0x30) {
      if (at + 1 + (std::uint64_t{1} << (byte(at) & 0x0FU)) > table_) fail("malformed binary property list");
    }
  }

  void walkChildren(std::uint64_t object, std::uint64_t at, std::uint64_t references, int depth) {
    if (!open_.insert(object).second) return fail("a value that contains itself");
    for (std::uint64_t i = 0; i < references && !problem_; ++i) {
      const std::uint64_t child = number(at + i * reference_size_, reference_size_);
      if (child >= objects_) return fail("malformed binary property list");
      walk(child, depth + 1);
    }
    open_.erase(object);
  }

  std::string_view bytes_;
  unsigned offset_size_ = 0;
  unsigned reference_size_ = 0;
  std::uint64_t objects_ = 0;
  std::uint64_t table_ = 0;
  std::size_t nodes_ = 0;
  std::set<std::uint64_t> open_;
  std::optional<std::string> problem_;
};

}  // namespace

std::optional<std::string> refuseXml(std::string_view text) {
  int depth = 0;
  std::size_t elements = 0;
  for (std::size_t at = text.find('<'); at != std::string_view::npos; at = text.find('<', at)) {
    const std::string_view rest = text.substr(at);
    if (rest.starts_with("<!--")) {
      at = behind(text, at + 4, "-->");
    } else if (rest.starts_with("<![CDATA[")) {
      at = behind(text, at, "]]>");
    } else if (rest.starts_with("<?")) {
      at = behind(text, at, "?>");
    } else {
      const std::size_t end = endOfTag(text, at);
      if (end == std::string_view::npos) return "a tag that does not end";
      if (rest.starts_with("<!")) {
        if (rest.substr(0, end - at).find('[') != std::string_view::npos) return "a DOCTYPE with definitions";
      } else if (rest.starts_with("</")) {
        --depth;
      } else if (text[end - 2] != '/') {
        if (++depth > kPlistDepthLimit) return tooDeep();
        if (++elements > 2 * kPlistNodeLimit) return tooMany();
      }
      at = end;
    }
    if (at == std::string_view::npos) return "markup that does not end";
  }
  return std::nullopt;
}

std::optional<std::string> refuseBinary(std::string_view bytes) { return BinaryWalk(bytes).check(); }

}  // namespace lmx

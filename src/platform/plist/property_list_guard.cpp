// Walks binary property lists to check their size before they are parsed.
#include "platform/plist/property_list_guard.h"

#include <bit>
#include <cstdint>
#include <set>

#include "platform/plist/property_list.h"

namespace lmx {
namespace {

constexpr std::uint64_t kTrailerSize = 32;
constexpr std::uint64_t kHeaderSize = 8;
/// Total size of texts and data, each counted as often as it is referenced.
constexpr std::uint64_t kExpandedBytesLimit = 16U << 20;
/// Dates are passed on as 32-bit seconds.
constexpr double kDateLimit = 2147483647.0;
constexpr const char* kMalformed = "malformed binary property list";

class BinaryWalk {
 public:
  BinaryWalk(std::string_view bytes, std::size_t most) : bytes_(bytes), most_(most) {}

  std::optional<std::string> check() {
    if (bytes_.size() < kHeaderSize + kTrailerSize) return "too short for a binary property list";
    const std::uint64_t trailer = bytes_.size() - kTrailerSize;
    offset_size_ = byte(trailer + 6);
    reference_size_ = byte(trailer + 7);
    objects_ = number(trailer + 8, 8);
    const std::uint64_t top = number(trailer + 16, 8);
    table_ = number(trailer + 24, 8);
    const bool sizes_fit = std::has_single_bit(offset_size_) && offset_size_ <= 8 &&
                           std::has_single_bit(reference_size_) && reference_size_ <= 8;
    if (!sizes_fit || objects_ > bytes_.size() || table_ < kHeaderSize || table_ > trailer ||
        objects_ * offset_size_ > trailer - table_ || top >= objects_) {
      return kMalformed;
    }
    walk(top, 1);
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

  /// Offset of an object; 0 when it lies outside the object area.
  [[nodiscard]] std::uint64_t placeOf(std::uint64_t object) const {
    const std::uint64_t at = number(table_ + object * offset_size_, offset_size_);
    return at >= kHeaderSize && at < table_ ? at : 0;
  }

  /// Reads the element count at a marker and moves `at` to the elements. @return false when it does not fit
  bool readCount(std::uint64_t& at, std::uint64_t& count) const {
    count = byte(at) & 0x0FU;
    ++at;
    if (count != 0x0F) return true;
    if (at >= table_ || (byte(at) & 0xF0U) != 0x10 || (byte(at) & 0x0FU) > 3) return false;
    const unsigned size = 1U << (byte(at) & 0x0FU);
    if (size >= table_ - at) return false;
    count = number(at + 1, size);
    at += 1 + size;
    return count <= bytes_.size();
  }

  void walk(std::uint64_t object, int depth) {
    if (depth > kPlistDepthLimit) return fail(tooDeep());
    if (++nodes_ > most_) return fail("more than " + std::to_string(most_) + " values");
    const std::uint64_t at = placeOf(object);
    if (at == 0) return fail(kMalformed);
    switch (byte(at) & 0xF0U) {
      case 0x00:
        return walkBoolean(at);
      case 0x10:
        return walkFixed(at, 4);
      case 0x20:
        return walkFixed(at, 3);
      case 0x30:
        return walkDate(at);
      case 0x40:
        return (void)walkBytes(at, 1, 1);
      case 0x50:
      case 0x60:
        return walkText(at);
      case 0xA0:
      case 0xD0:
        return walkContainer(object, at, depth);
      default:
        return fail("a value of a kind that is not supported");
    }
  }

  void walkBoolean(std::uint64_t at) {
    if (byte(at) != 0x08 && byte(at) != 0x09) fail("a value of a kind that is not supported");
  }

  /// A number of 2^n bytes, where n is at most `maximum`.
  void walkFixed(std::uint64_t at, unsigned maximum) {
    const unsigned exponent = byte(at) & 0x0FU;
    const bool real_too_short = maximum == 3 && exponent < 2;
    if (exponent > maximum || real_too_short || (1ULL << exponent) >= table_ - at) fail(kMalformed);
  }

  void walkDate(std::uint64_t at) {
    if (byte(at) != 0x33 || table_ - at <= 8) return fail(kMalformed);
    const double seconds = std::bit_cast<double>(number(at + 1, 8));
    if (!(seconds >= -kDateLimit && seconds <= kDateLimit)) fail("a date out of range");
  }

  /// @return the bytes; empty when they are rejected
  std::string_view walkBytes(std::uint64_t at, unsigned unit, unsigned expanded) {
    std::uint64_t count = 0;
    if (!readCount(at, count) || count * unit > table_ - at) {
      fail(kMalformed);
      return {};
    }
    expanded_bytes_ += count * expanded;
    if (expanded_bytes_ > kExpandedBytesLimit) {
      fail("texts and data of more than " + std::to_string(kExpandedBytesLimit) + " bytes");
    }
    return bytes_.substr(at, count * unit);
  }

  void walkText(std::uint64_t at) {
    const bool wide = (byte(at) & 0xF0U) == 0x60;
    // Two bytes of UTF-16 become up to three bytes of UTF-8.
    const std::string_view text = walkBytes(at, wide ? 2 : 1, wide ? 3 : 1);
    const std::size_t step = wide ? 2 : 1;
    for (std::size_t i = 0; i < text.size(); i += step) {
      // libplist aborts the process on such a text.
      if (text[i] == '\0' && text[i + step - 1] == '\0') return fail("a NUL character");
    }
  }

  void walkContainer(std::uint64_t object, std::uint64_t at, int depth) {
    const bool dictionary = (byte(at) & 0xF0U) == 0xD0;
    std::uint64_t count = 0;
    if (!readCount(at, count)) return fail(kMalformed);
    const std::uint64_t references = dictionary ? count * 2 : count;
    if (references * reference_size_ > table_ - at) return fail(kMalformed);
    if (!open_.insert(object).second) return fail("a value that contains itself");
    for (std::uint64_t i = 0; i < references && !problem_; ++i) {
      const std::uint64_t child = number(at + i * reference_size_, reference_size_);
      if (child >= objects_) return fail(kMalformed);
      // A dictionary lists its keys before its values.
      if (dictionary && i < count) {
        walkKey(child);
      } else {
        walk(child, depth + 1);
      }
    }
    open_.erase(object);
  }

  void walkKey(std::uint64_t object) {
    const std::uint64_t at = placeOf(object);
    const unsigned kind = at == 0 ? 0 : byte(at) & 0xF0U;
    if (kind != 0x50 && kind != 0x60) return fail("a key that is not a text");
    walkText(at);
  }

  static std::string tooDeep() { return "nested more than " + std::to_string(kPlistDepthLimit) + " levels"; }

  std::string_view bytes_;
  std::size_t most_;
  unsigned offset_size_ = 0;
  unsigned reference_size_ = 0;
  std::uint64_t objects_ = 0;
  std::uint64_t table_ = 0;
  std::size_t nodes_ = 0;
  std::uint64_t expanded_bytes_ = 0;
  std::set<std::uint64_t> open_;  ///< containers being walked; finding one again means a cycle
  std::optional<std::string> problem_;
};

}  // namespace

std::optional<std::string> refuseBinary(std::string_view bytes, std::size_t values) {
  return BinaryWalk(bytes, values).check();
}

}  // namespace lmx

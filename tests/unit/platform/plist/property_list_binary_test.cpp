// Binary property lists, especially malicious ones.
#include <gtest/gtest.h>

#include <bit>
#include <vector>

#include "platform/plist/property_list.h"

namespace lmx {
namespace {

std::string bigEndian(std::uint64_t value, int size) {
  std::string out;
  for (int i = size - 1; i >= 0; --i) out += static_cast<char>(value >> (8 * i) & 0xFF);
  return out;
}

/// A binary property list with these objects and two-byte offsets and references.
std::string binary(const std::vector<std::string>& objects, std::uint64_t top = 0) {
  std::string out = "bplist00";
  std::string table;
  for (const std::string& object : objects) {
    table += bigEndian(out.size(), 2);
    out += object;
  }
  const std::uint64_t table_at = out.size();
  return out + table + std::string(6, '\0') + "\x02\x02" + bigEndian(objects.size(), 8) + bigEndian(top, 8) +
         bigEndian(table_at, 8);
}

std::string counted(unsigned kind, std::size_t count) {
  if (count < 15) return std::string(1, static_cast<char>(kind | count));
  return std::string(1, static_cast<char>(kind | 0x0F)) + '\x11' + bigEndian(count, 2);
}
std::string ascii(const std::string& text) { return counted(0x50, text.size()) + text; }
std::string container(unsigned kind, std::size_t count, const std::vector<std::uint64_t>& references) {
  std::string out = counted(kind, count);
  for (const std::uint64_t reference : references) out += bigEndian(reference, 2);
  return out;
}
std::string array(const std::vector<std::uint64_t>& items) { return container(0xA0, items.size(), items); }
/// References to the keys come first, then those to the values.
std::string dictionary(const std::vector<std::uint64_t>& references) {
  return container(0xD0, references.size() / 2, references);
}
std::string real(double value) { return '\x23' + bigEndian(std::bit_cast<std::uint64_t>(value), 8); }
std::string date(double value) { return '\x33' + bigEndian(std::bit_cast<std::uint64_t>(value), 8); }
const std::string kTrue = "\x09";

std::string problemOf(const std::string& bytes) {
  const PlistResult result = parsePropertyList(bytes);
  return result ? "" : result.error().message;
}

TEST(BinaryPropertyList, EveryKindOfValueIsRead) {
  const std::string utf16("\x61\x00\xE4", 3);  // the marker, then "ä"
  const PlistResult result = parsePropertyList(binary({
      array({1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11}),
      kTrue,
      "\x08",
      "\x10\x2A",
      '\x13' + bigEndian(static_cast<std::uint64_t>(-5), 8),
      real(-0.5),
      date(86400),
      std::string("\x43\x00\x01\xFF", 4),
      ascii("text"),
      utf16,
      ascii(std::string(20, 'x')),
      dictionary({8, 1}),
  }));
  ASSERT_TRUE(result) << result.error().message;
  const PlistArray expected{true,
                            false,
                            std::int64_t{42},
                            std::int64_t{-5},
                            -0.5,
                            PlistDate{86400},
                            PlistValue::Data{0, 1, 255},
                            "text",
                            "\xC3\xA4",
                            std::string(20, 'x'),
                            PlistDictionary{{"text", true}}};
  EXPECT_EQ(*result, PlistValue(expected));
}

TEST(BinaryPropertyList, SharedValuesAreCountedAsOftenAsTheyExpand) {
  // Six arrays, each with ten references to the next one: a million values in two hundred bytes.
  std::vector<std::string> objects;
  for (std::uint64_t level = 1; level <= 6; ++level)
    objects.push_back(array(std::vector<std::uint64_t>(10, level)));
  objects.push_back(kTrue);
  const std::string bytes = binary(objects);
  EXPECT_LT(bytes.size(), 250U);
  EXPECT_EQ(problemOf(bytes), "more than 10000 values");
}

TEST(BinaryPropertyList, SharedValuesWithinTheLimitAreRead) {
  const PlistResult result = parsePropertyList(binary({array({1, 1}), array({2, 2}), kTrue}));
  const PlistArray pair{true, true};
  EXPECT_EQ(result.value(), PlistValue(PlistArray{pair, pair}));
}

TEST(BinaryPropertyList, SharedTextsAreCountedAsOftenAsTheyExpand) {
  const std::string bytes =
      binary({array(std::vector<std::uint64_t>(9000, 1)), ascii(std::string(40000, 'x'))});
  EXPECT_EQ(problemOf(bytes), "texts and data of more than 16777216 bytes");
}

TEST(BinaryPropertyList, TenThousandValuesAreTheLimit) {
  EXPECT_TRUE(parsePropertyList(binary({array(std::vector<std::uint64_t>(9999, 1)), kTrue})));
  EXPECT_EQ(problemOf(binary({array(std::vector<std::uint64_t>(10000, 1)), kTrue})),
            "more than 10000 values");
}

TEST(BinaryPropertyList, SixtyFourLevelsAreTheLimit) {
  const auto nested = [](std::uint64_t levels) {
    std::vector<std::string> objects;
    for (std::uint64_t i = 1; i < levels; ++i) objects.push_back(array({i}));
    objects.push_back(kTrue);
    return binary(objects);
  };
  EXPECT_TRUE(parsePropertyList(nested(64)));
  EXPECT_EQ(problemOf(nested(65)), "nested more than 64 levels");
}

TEST(BinaryPropertyList, SelfReferencesAreRejected) {
  EXPECT_EQ(problemOf(binary({array({0})})), "a value that contains itself");
  EXPECT_EQ(problemOf(binary({array({1}), dictionary({2, 0}), ascii("k")})), "a value that contains itself");
}

TEST(BinaryPropertyList, KeysMustBeTexts) {
  EXPECT_EQ(problemOf(binary({dictionary({1, 1}), kTrue})), "a key that is not a text");
  EXPECT_EQ(problemOf(binary({dictionary({0, 1}), kTrue})), "a key that is not a text");
}

TEST(BinaryPropertyList, UnsupportedKindsAreRejected) {
  for (const std::string& object : {std::string(1, '\0'), std::string("\x0F"), std::string("\x80\x01"),
                                    std::string("\xC0"), std::string("\x70"), std::string("\xF0")}) {
    EXPECT_EQ(problemOf(binary({object})), "a value of a kind that is not supported");
  }
}

TEST(BinaryPropertyList, TextsWithNulAreRejected) {
  EXPECT_EQ(problemOf(binary({ascii(std::string("a\0b", 3))})), "a NUL character");
  EXPECT_EQ(problemOf(binary({std::string("\x62\x00\x61\x00\x00", 5)})), "a NUL character");
  EXPECT_EQ(problemOf(binary({dictionary({1, 2}), ascii(std::string(1, '\0')), kTrue})), "a NUL character");
  EXPECT_EQ(parsePropertyList(binary({std::string("\x61\x01\x00", 3)})).value(), PlistValue("\xC4\x80"));
}

TEST(BinaryPropertyList, DatesOutOfRangeAreRejected) {
  EXPECT_EQ(problemOf(binary({date(1e300)})), "a date out of range");
  EXPECT_EQ(problemOf(binary({'\x33' + bigEndian(0x7FF8000000000000, 8)})), "a date out of range");
}

TEST(BinaryPropertyList, MalformedTablesAreRefused) {
  const std::string good = binary({array({1}), kTrue});
  const std::size_t trailer = good.size() - 32;
  const auto with = [&](std::size_t at, const std::string& bytes) {
    std::string text = good;
    return text.replace(at, bytes.size(), bytes);
  };
  const std::string malformed = "malformed binary property list";
  EXPECT_EQ(problemOf(with(trailer + 6, std::string(1, '\0'))), malformed);
  EXPECT_EQ(problemOf(with(trailer + 6, "\x03")), malformed);
  EXPECT_EQ(problemOf(with(trailer + 7, "\x09")), malformed);
  EXPECT_EQ(problemOf(with(trailer + 8, bigEndian(0, 8))), malformed);
  EXPECT_EQ(problemOf(with(trailer + 8, bigEndian(~0ULL, 8))), malformed);
  EXPECT_EQ(problemOf(with(trailer + 16, bigEndian(2, 8))), malformed);
  EXPECT_EQ(problemOf(with(trailer + 24, bigEndian(~0ULL, 8))), malformed);
  EXPECT_EQ(problemOf(with(trailer + 24, bigEndian(0, 8))), malformed);
  EXPECT_EQ(problemOf(binary({array({7})})), malformed);
  EXPECT_EQ(problemOf(binary({std::string("\x5F\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF", 10)})), malformed);
  EXPECT_EQ(problemOf(binary({std::string("\xDF\x13\x80\x00\x00\x00\x00\x00\x00\x00", 10)})), malformed);
  EXPECT_EQ(problemOf(binary({"\x13\x01"})), malformed);
  EXPECT_EQ(problemOf("bplist00"), "too short for a binary property list");
}

TEST(BinaryPropertyList, SurvivesTruncationAndEveryFlippedBit) {
  const std::string good = binary({dictionary({1, 2, 3, 4}), ascii("a"), ascii("b"), array({5, 6}), kTrue,
                                   real(1), std::string("\x61\x00\xE4", 3)});
  for (std::size_t length = 0; length < good.size(); ++length)
    EXPECT_FALSE(parsePropertyList(good.substr(0, length)));
  for (std::size_t bit = 0; bit < good.size() * 8; ++bit) {
    std::string bytes = good;
    bytes[bit / 8] = static_cast<char>(bytes[bit / 8] ^ (1 << (bit % 8)));
    const PlistResult result = parsePropertyList(bytes);
    EXPECT_TRUE(result || !result.error().message.empty());
  }
}

}  // namespace
}  // namespace lmx

// Tests of the Base64 functions.
#include "support/base64.h"

#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "support/heap_ptr.h"

namespace lmx {
namespace {

std::string encoded(const std::string& bytes) {
  std::size_t length = 0;
  const heap_ptr<char> text(lmp_encode_base64(bytes.data(), bytes.size(), &length));
  EXPECT_EQ(text.get()[length], '\0');
  return {text.get(), length};
}

std::optional<std::string> decoded(const std::string& text) {
  std::size_t length = 0;
  const heap_ptr<unsigned char> bytes(lmp_decode_base64(text.c_str(), &length));
  if (!bytes) return std::nullopt;
  return std::string(reinterpret_cast<const char*>(bytes.get()), length);
}

struct Pair {
  const char* bytes;
  const char* text;
};
constexpr Pair kVectors[] = {{"", ""},
                             {"f", "Zg=="},
                             {"fo", "Zm8="},
                             {"foo", "Zm9v"},
                             {"foob", "Zm9vYg=="},
                             {"fooba", "Zm9vYmE="},
                             {"foobar", "Zm9vYmFy"}};

TEST(Base64, EncodesTheVectorsOfTheRfc) {
  for (const auto& [bytes, text] : kVectors) EXPECT_EQ(encoded(bytes), text);
}

TEST(Base64, DecodesTheVectorsOfTheRfc) {
  for (const auto& [bytes, text] : kVectors) EXPECT_EQ(decoded(text), bytes);
}

TEST(Base64, SixteenBytesBecomeTwentyFourCharactersAndComeBack) {
  const std::string bytes("\x00\xFF\x10\x80zyxwvutsrqp\x01", 16);
  const std::string text = encoded(bytes);
  EXPECT_EQ(text.size(), 24U);
  EXPECT_TRUE(text.ends_with("=="));
  EXPECT_EQ(decoded(text), bytes);
}

TEST(Base64, EveryByteSurvives) {
  std::string bytes;
  for (int i = 0; i < 256; ++i) bytes += static_cast<char>(i);
  EXPECT_EQ(decoded(encoded(bytes)), bytes);
}

TEST(Base64, CharacterOutsideOfTheAlphabetIsRefused) {
  for (const char* text : {"Zm9*", "Zm9v\n", "Zm9\n", " Zm9", "Zm-_", "Zm9\xC3", "Zm9v Zm9"}) {
    EXPECT_EQ(decoded(text), std::nullopt) << text;
  }
}

TEST(Base64, WrongPaddingIsRefused) {
  for (const char* text : {"Z", "Zg", "Zg=", "Zm8", "=", "==", "====", "Z===", "Zg==Zg==", "Z=g=", "Zm9v="}) {
    EXPECT_EQ(decoded(text), std::nullopt) << text;
  }
}

TEST(Base64, LengthIsOptional) {
  const heap_ptr<char> text(lmp_encode_base64("abc", 3, nullptr));
  EXPECT_STREQ(text.get(), "YWJj");
  const heap_ptr<unsigned char> bytes(lmp_decode_base64("YWJj", nullptr));
  ASSERT_TRUE(bytes);
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(bytes.get()), 3), "abc");
}

TEST(Base64, AbsentInputIsRefused) {
  EXPECT_EQ(lmp_encode_base64(nullptr, 1, nullptr), nullptr);
  EXPECT_EQ(lmp_decode_base64(nullptr, nullptr), nullptr);
}

}  // namespace
}  // namespace lmx

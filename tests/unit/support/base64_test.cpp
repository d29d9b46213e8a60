// Base64 encoding and decoding.
#include "support/base64.h"

#include <gtest/gtest.h>

#include <optional>
#include <string>

namespace lmx {
namespace {

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
  for (const auto& [bytes, text] : kVectors) EXPECT_EQ(lmp_encode_base64(bytes), text);
}

TEST(Base64, DecodesTheVectorsOfTheRfc) {
  for (const auto& [bytes, text] : kVectors) EXPECT_EQ(lmp_decode_base64(text), bytes);
}

TEST(Base64, SixteenBytesBecomeTwentyFourCharactersAndComeBack) {
  const std::string bytes("\x00\xFF\x10\x80zyxwvutsrqp\x01", 16);
  const std::string text = lmp_encode_base64(bytes);
  EXPECT_EQ(text.size(), 24U);
  EXPECT_TRUE(text.ends_with("=="));
  EXPECT_EQ(lmp_decode_base64(text), bytes);
}

TEST(Base64, EveryByteSurvives) {
  std::string bytes;
  for (int i = 0; i < 256; ++i) bytes += static_cast<char>(i);
  EXPECT_EQ(lmp_decode_base64(lmp_encode_base64(bytes)), bytes);
}

TEST(Base64, CharacterOutsideOfTheAlphabetIsRefused) {
  for (const char* text : {"Zm9*", "Zm9v\n", "Zm9\n", " Zm9", "Zm-_", "Zm9\xC3", "Zm9v Zm9"}) {
    EXPECT_EQ(lmp_decode_base64(text), std::nullopt) << text;
  }
}

TEST(Base64, WrongPaddingIsRefused) {
  for (const char* text : {"Z", "Zg", "Zg=", "Zm8", "=", "==", "====", "Z===", "Zg==Zg==", "Z=g=", "Zm9v="}) {
    EXPECT_EQ(lmp_decode_base64(text), std::nullopt) << text;
  }
}

}  // namespace
}  // namespace lmx

// UTF-8 and the characters that XML allows.
#include "support/utf8.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(Utf8, Utf8IsToldFromOtherBytes) {
  for (const char* good : {"", "STATUS", "Hörsaal", "\u0085", "講堂", "\U0001F3A5", "\xF4\x8F\xBF\xBF"}) {
    EXPECT_TRUE(isUtf8(good)) << good;
  }
  for (const char* bad :
       {"\x80", "H\xF6rsaal", "\xC3", "\xC0\xAF", "\xE0\x80\x80", "\xED\xA0\x80", "\xF0\x80\x80\x80",
        "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xE2\x80", "\xE2\x80x"}) {
    EXPECT_FALSE(isUtf8(bad)) << bad;
  }
}

TEST(Utf8, XmlHoldsLessThanUtf8) {
  for (const char* held : {"a", "\t", "\n", "\r", "\u0085", "\uFFFD", "\U0010FFFF"}) {
    EXPECT_EQ(xmlCharacterLength(held), std::string_view(held).size()) << held;
  }
  for (const char* other : {"", "\x01", "\x1F", "\uFFFE", "\uFFFF", "\xED\xA0\x80", "\xFF"}) {
    EXPECT_EQ(xmlCharacterLength(other), 0U) << other;
  }
}

TEST(Utf8, WhatXmlCannotHoldIsSubstitutedByteByByte) {
  EXPECT_EQ(xmlText("H\xF6rsaal \x01 Größe", "?"), "H?rsaal ? Größe");
  EXPECT_EQ(xmlText("\uFFFE", "?"), "???");
  EXPECT_EQ(xmlText("", "?"), "");
}

}  // namespace
}  // namespace lmx

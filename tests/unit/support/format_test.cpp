// Formatting into a string.
#include "support/format.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(StringWithFormat, FormatsAsPrintf) {
  EXPECT_EQ(string_with_format("%s-%03d-%.2f%%", "a", 7, 1.5), "a-007-1.50%");
}

TEST(StringWithFormat, LongTextIsNotTruncated) {
  for (const std::size_t length : {0U, 255U, 256U, 257U, 100000U}) {
    const std::string text(length, 'x');
    EXPECT_EQ(string_with_format("%s", text.c_str()), text);
  }
}

TEST(StringWithFormat, IsEmptyWhenFormattingFails) {
  // A character without an encoding in the C locale.
  const wchar_t text[] = {0x20AC, 0};
  EXPECT_EQ(string_with_format("%ls", text), "");
}

TEST(TextOrNull, AnAbsentTextHasASpellingOfItsOwn) {
  EXPECT_EQ(textOrNull(std::nullopt), "(null)");
  EXPECT_EQ(textOrNull(""), "");
  EXPECT_EQ(textOrNull("Hall 3"), "Hall 3");
}

}  // namespace
}  // namespace lmx

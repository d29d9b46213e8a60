// Tests of formatting into memory of its own.
#include "support/format.h"

#include <gtest/gtest.h>

#include "support/heap_ptr.h"

namespace lmx {
namespace {

TEST(StringWithFormat, FormatsAsPrintf) {
  const heap_ptr<char> text(string_with_format("%s-%03d-%.2f", "a", 7, 1.5));
  EXPECT_STREQ(text.get(), "a-007-1.50");
}

TEST(StringWithFormat, EmptyTextIsNotAFailure) {
  const heap_ptr<char> text(string_with_format("%s", ""));
  ASSERT_TRUE(text);
  EXPECT_STREQ(text.get(), "");
}

TEST(StringWithFormat, LongTextIsWhole) {
  const std::string large(100000, 'x');
  const heap_ptr<char> text(string_with_format("<%s>", large.c_str()));
  EXPECT_EQ(text.get(), "<" + large + ">");
}

TEST(StringWithFormat, TextThatCannotBeFormattedIsAFailure) {
  // A character that the C locale has no encoding for.
  const wchar_t text[] = {0x20AC, 0};
  EXPECT_EQ(string_with_format("%ls", text), nullptr);
  EXPECT_EQ(formatted("%ls", text), "");
}

TEST(Formatted, GivesAString) { EXPECT_EQ(formatted("%d%%", 12), "12%"); }

}  // namespace
}  // namespace lmx

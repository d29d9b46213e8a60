// Numbers at the beginning of a text, and dates as text.
#include "support/scan.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include "support/date_text.h"

namespace lmx {
namespace {

TEST(ScanInteger, ReadsWhatStandsAtTheBeginning) {
  EXPECT_EQ(scanInteger("60"), 60);
  EXPECT_EQ(scanInteger(" \t60"), 60);
  EXPECT_EQ(scanInteger("-5"), -5);
  EXPECT_EQ(scanInteger("+5"), 5);
  EXPECT_EQ(scanInteger("60 minutes"), 60);
  EXPECT_EQ(scanInteger("1.9"), 1);
  EXPECT_EQ(scanInteger("0x10"), 0);
}

TEST(ScanInteger, NothingIsNotZero) {
  for (const char* text : {"", " ", "abc", "-", "+-5", "99999999999", "\xFF"})
    EXPECT_FALSE(scanInteger(text)) << text;
}

TEST(ScanReal, ReadsDecimalsWhateverFollows) {
  EXPECT_EQ(scanReal("1.5"), 1.5);
  EXPECT_EQ(scanReal(" 2e2x"), 200.0);
  EXPECT_EQ(scanReal("-5"), -5.0);
  EXPECT_EQ(scanReal("1,5"), 1.0);
}

TEST(ScanReal, OnlyFiniteNumbersCount) {
  for (const char* text : {"", "abc", "inf", "nan", "1e999"}) EXPECT_FALSE(scanReal(text)) << text;
}

class DateText : public ::testing::Test {
 protected:
  void zone(const char* name) {
    setenv("TZ", name, 1);
    tzset();
  }
  ~DateText() override {
    unsetenv("TZ");
    tzset();
  }
};

TEST_F(DateText, IsLocalTimeWithItsOffset) {
  zone("CET-1CEST,M3.5.0,M10.5.0/3");
  EXPECT_EQ(dateText(1246363500), "2009-06-30 14:05:00 +0200");
  EXPECT_EQ(dateText(1230768000), "2009-01-01 01:00:00 +0100");
  zone("IST-5:30");
  EXPECT_EQ(dateText(1246363500), "2009-06-30 17:35:00 +0530");
  zone("EST5");
  EXPECT_EQ(dateText(0), "1969-12-31 19:00:00 -0500");
}

TEST_F(DateText, AYearBeyondTheCalendarHasNone) { EXPECT_FALSE(dateText(1LL << 62)); }

}  // namespace
}  // namespace lmx

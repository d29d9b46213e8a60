// Numbers at the beginning of a text, and the text form of dates.
#include "support/scan.h"

#include <gtest/gtest.h>

#include <stdlib.h>
#include <limits>

#include "support/date_text.h"

namespace lmx {
namespace {

TEST(ScanInteger, ReadsTheLeadingNumber) {
  EXPECT_EQ(scanInteger("60"), 60);
  EXPECT_EQ(scanInteger(" \t60"), 60);
  EXPECT_EQ(scanInteger("-5"), -5);
  EXPECT_EQ(scanInteger("+5"), 5);
  EXPECT_EQ(scanInteger("60 minutes"), 60);
  EXPECT_EQ(scanInteger("1.9"), 1);
  EXPECT_EQ(scanInteger("0x10"), 0);
}

TEST(ScanInteger, RejectsTextWithoutANumberThatFits) {
  for (const char* text : {"", " ", "abc", "-", "+-5", "99999999999", "\xFF"})
    EXPECT_FALSE(scanInteger(text)) << text;
}

TEST(ScanReal, IgnoresTrailingText) {
  EXPECT_EQ(scanReal("1.5"), 1.5);
  EXPECT_EQ(scanReal(" 2e2x"), 200.0);
  EXPECT_EQ(scanReal("-5"), -5.0);
  EXPECT_EQ(scanReal("1,5"), 1.0);
}

TEST(ScanReal, RejectsTextAndNonFiniteNumbers) {
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

TEST_F(DateText, IsLocalTimeWithOffset) {
  zone("CET-1CEST,M3.5.0,M10.5.0/3");
  EXPECT_EQ(dateText(1246363500), "2009-06-30 14:05:00 +0200");
  EXPECT_EQ(dateText(1230768000), "2009-01-01 01:00:00 +0100");
  zone("IST-5:30");
  EXPECT_EQ(dateText(1246363500), "2009-06-30 17:35:00 +0530");
  zone("EST5");
  EXPECT_EQ(dateText(0), "1969-12-31 19:00:00 -0500");
}

TEST_F(DateText, IsAbsentForAYearOutOfRange) { EXPECT_FALSE(dateText(1LL << 62)); }

TEST(DateFromText, ReadsTheTimerFormat) {
  EXPECT_EQ(dateFromText("1970-01-01 00:00:00 +0000"), 0);
  EXPECT_EQ(dateFromText("2011-03-14 09:00:00 +0100"), 1300089600);
  EXPECT_EQ(dateFromText("2011-03-14 13:30:00 +0530"), 1300089600);
  EXPECT_EQ(dateFromText("2011-03-14 00:00:00 -0800"), 1300089600);
  EXPECT_EQ(dateFromText("2028-02-29 12:00:00 +0000"), 1835438400);
  EXPECT_EQ(dateFromText("1969-12-31 23:59:59 +0000"), -1);
}

TEST(DateFromText, RejectsOtherFormsAndInvalidDates) {
  for (const char* text : {"",
                           "now",
                           "2011-03-14",
                           "2011-03-14 09:00:00",
                           "2011-03-14T09:00:00 +0100",
                           "2011-03-14 09:00:00 0100",
                           "2011-03-14 09:00:00 +01:00",
                           "2011-03-14 09:00:00 +0100 ",
                           " 2011-03-14 09:00:00 +0100",
                           "2011-3-14 09:00:00 +0100",
                           "2011-13-14 09:00:00 +0100",
                           "2011-02-29 09:00:00 +0100",
                           "2100-02-29 09:00:00 +0000",
                           "2011-04-31 09:00:00 +0100",
                           "2011-03-00 09:00:00 +0100",
                           "2011-03-14 24:00:00 +0100",
                           "2011-03-14 09:60:00 +0100",
                           "2011-03-14 09:00:60 +0100",
                           "2011-03-14 09:00:00 +2400",
                           "2011-03-14 09:00:00 +0160",
                           "-011-03-14 09:00:00 +0100"}) {
    EXPECT_FALSE(dateFromText(text)) << text;
  }
}

TEST_F(DateText, RoundTrips) {
  zone("IST-5:30");
  for (const std::time_t at : {0L, 1246363500L, 1835438400L}) EXPECT_EQ(dateFromText(*dateText(at)), at);
}

TEST(Scan, DecimalValueStopsAtTheFirstOtherCharacterAndAtTheLimits) {
  EXPECT_EQ(decimalValue("2"), 2);
  EXPECT_EQ(decimalValue(" 17minutes"), 17);
  EXPECT_EQ(decimalValue("-3"), -3);
  EXPECT_EQ(decimalValue("x"), 0);
  EXPECT_EQ(decimalValue(""), 0);
  EXPECT_EQ(decimalValue("99999999999999999999"), std::numeric_limits<std::int32_t>::max());
  EXPECT_EQ(decimalValue("-99999999999"), std::numeric_limits<std::int32_t>::min());
}

}  // namespace
}  // namespace lmx

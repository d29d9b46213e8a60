// Converts dates to text and back.
#include "support/date_text.h"

#include <array>

namespace lmx {
namespace {

/// Parses a text from the front. After the first mismatch everything else fails, too.
class DateScanner {
 public:
  explicit DateScanner(std::string_view text) : rest_(text) {}

  int number(std::size_t digits) {
    int value = 0;
    for (std::size_t i = 0; i < digits; ++i) {
      if (rest_.empty() || rest_.front() < '0' || rest_.front() > '9') return fail();
      value = value * 10 + (rest_.front() - '0');
      rest_.remove_prefix(1);
    }
    return value;
  }
  void literal(char wanted) {
    if (!rest_.starts_with(wanted)) {
      fail();
      return;
    }
    rest_.remove_prefix(1);
  }
  /// @return 1 or -1
  int sign() {
    const int value = rest_.starts_with('-') ? -1 : 1;
    literal(value < 0 ? '-' : '+');
    return value;
  }
  [[nodiscard]] bool fits() const { return fits_ && rest_.empty(); }

 private:
  int fail() {
    fits_ = false;
    rest_ = {};
    return 0;
  }
  std::string_view rest_;
  bool fits_ = true;
};

int daysOf(int year, int month) {
  constexpr std::array kDays{31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const bool leap = (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
  return kDays[static_cast<std::size_t>(month - 1)] + (month == 2 && leap ? 1 : 0);
}

}  // namespace

std::optional<std::string> dateText(std::time_t seconds) {
  std::tm local{};
  if (localtime_r(&seconds, &local) == nullptr) return std::nullopt;
  char text[64];
  if (std::strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S %z", &local) == 0) return std::nullopt;
  return text;
}

std::optional<std::time_t> dateFromText(std::string_view text) {
  DateScanner scan(text);
  const int year = scan.number(4);
  scan.literal('-');
  const int month = scan.number(2);
  scan.literal('-');
  const int day = scan.number(2);
  scan.literal(' ');
  const int hour = scan.number(2);
  scan.literal(':');
  const int minute = scan.number(2);
  scan.literal(':');
  const int second = scan.number(2);
  scan.literal(' ');
  const int sign = scan.sign();
  const int offset_hours = scan.number(2);
  const int offset_minutes = scan.number(2);
  if (!scan.fits() || month < 1 || month > 12 || day < 1 || day > daysOf(year, month) || hour > 23 ||
      minute > 59 || second > 59 || offset_hours > 23 || offset_minutes > 59) {
    return std::nullopt;
  }
  std::tm utc{};
  utc.tm_year = year - 1900;
  utc.tm_mon = month - 1;
  utc.tm_mday = day;
  utc.tm_hour = hour;
  utc.tm_min = minute;
  utc.tm_sec = second;
  return timegm(&utc) - static_cast<std::time_t>(sign) * (offset_hours * 3600 + offset_minutes * 60);
}

}  // namespace lmx

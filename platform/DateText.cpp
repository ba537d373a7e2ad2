#include "platform/DateText.h"

#include <chrono>
#include <cmath>

namespace platform {
namespace {

using Days = std::chrono::sys_days;
constexpr Days referenceDay = std::chrono::year{2001} / 1 / 1;

void writeDigits(char* at, int digits, unsigned number) {
  for (char* digit = at + digits; digit != at; number /= 10) *--digit = static_cast<char>('0' + number % 10);
}

/// The number that the digits at the place make, or -1.
int readDigits(std::string_view text, std::size_t at, std::size_t digits) {
  int number = 0;
  for (char digit : text.substr(at, digits)) {
    if (digit < '0' || digit > '9') return -1;
    number = number * 10 + (digit - '0');
  }
  return number;
}

}  // namespace

std::optional<DateText> dateText(Date date) noexcept {
  if (!hasText(date)) return {};
  std::chrono::seconds seconds(static_cast<std::int64_t>(std::floor(date.seconds)));
  auto day = std::chrono::floor<std::chrono::days>(seconds);
  std::chrono::year_month_day calendar(referenceDay + day);
  std::chrono::hh_mm_ss time(seconds - day);

  DateText text{{'0', '0', '0', '0', '-', '0', '0', '-', '0', '0', 'T', '0', '0', ':', '0', '0', ':', '0', '0', 'Z'}};
  writeDigits(text.characters, 4, static_cast<unsigned>(static_cast<int>(calendar.year())));
  writeDigits(text.characters + 5, 2, static_cast<unsigned>(calendar.month()));
  writeDigits(text.characters + 8, 2, static_cast<unsigned>(calendar.day()));
  writeDigits(text.characters + 11, 2, static_cast<unsigned>(time.hours().count()));
  writeDigits(text.characters + 14, 2, static_cast<unsigned>(time.minutes().count()));
  writeDigits(text.characters + 17, 2, static_cast<unsigned>(time.seconds().count()));
  return text;
}

std::optional<Date> dateFromText(std::string_view text) noexcept {
  if (text.size() != sizeof(DateText) || text[4] != '-' || text[7] != '-' || text[10] != 'T' || text[13] != ':' ||
      text[16] != ':' || text[19] != 'Z') {
    return {};
  }
  int year = readDigits(text, 0, 4), month = readDigits(text, 5, 2), day = readDigits(text, 8, 2);
  int hour = readDigits(text, 11, 2), minute = readDigits(text, 14, 2), second = readDigits(text, 17, 2);
  if (year < 1 || month < 1 || day < 1 || hour < 0 || minute < 0 || second < 0) return {};
  std::chrono::year_month_day calendar(std::chrono::year{year}, std::chrono::month(static_cast<unsigned>(month)),
                                       std::chrono::day(static_cast<unsigned>(day)));
  if (!calendar.ok() || hour > 23 || minute > 59 || second > 59) return {};
  std::chrono::seconds seconds = Days(calendar) - referenceDay;
  return Date{static_cast<double>(seconds.count()) + hour * 3600 + minute * 60 + second};
}

}  // namespace platform

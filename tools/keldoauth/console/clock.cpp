#include "tools/keldoauth/console/clock.h"

#include <array>
#include <charconv>
#include <cstdio>
#include <string_view>
#include <system_error>

namespace tool {
namespace {

constexpr long long kMinute = 60;
constexpr long long kHour = 60 * kMinute;
constexpr long long kDay = 24 * kHour;
constexpr long long kWeek = 7 * kDay;

struct Date {
  long long year;
  int month;
  int day;
};

/// Gregorian date of a count of days since 1970-01-01. Counting from the 1st of
/// March of the year 0 puts leap days at the end of a year; 400 years are an
/// era of 146097 days. The C library's own conversion ends in 2038 where
/// time_t has 32 bits.
Date dateOf(long long days) {
  const long long shifted = days + 719468;
  const long long era = shifted / 146097;
  const long long dayOfEra = shifted % 146097;
  const long long yearOfEra =
      (dayOfEra - dayOfEra / 1460 + dayOfEra / 36524 - dayOfEra / 146096) / 365;
  const long long dayOfYear = dayOfEra - (365 * yearOfEra + yearOfEra / 4 - yearOfEra / 100);
  const long long monthFromMarch = (5 * dayOfYear + 2) / 153;
  const long long month = monthFromMarch < 10 ? monthFromMarch + 3 : monthFromMarch - 9;
  const long long year = yearOfEra + era * 400 + (month <= 2 ? 1 : 0);
  return {year, static_cast<int>(month),
          static_cast<int>(dayOfYear - (153 * monthFromMarch + 2) / 5 + 1)};
}

/// The way back, of a year after 1.
long long daysUntil(const Date& date) {
  const long long year = date.month <= 2 ? date.year - 1 : date.year;
  const long long yearOfEra = year % 400;
  const long long monthFromMarch = date.month > 2 ? date.month - 3 : date.month + 9;
  const long long dayOfYear = (153 * monthFromMarch + 2) / 5 + date.day - 1;
  return year / 400 * 146097 + yearOfEra * 365 + yearOfEra / 4 - yearOfEra / 100 + dayOfYear -
         719468;
}

struct Unit {
  long long seconds;
  char letter;
};
constexpr std::array<Unit, 4> kUnits{{{kDay, 'd'}, {kHour, 'h'}, {kMinute, 'm'}, {1, 's'}}};

std::string amount(long long seconds, const Unit& unit) {
  return std::to_string(seconds / unit.seconds) + unit.letter;
}

/// 0 where there are no digits.
int digitsAt(std::string_view text, std::size_t position, std::size_t count) {
  int number = 0;
  std::from_chars(text.data() + position, text.data() + position + count, number);
  return number;
}

/// What is left out is the start of the day or minute. Whatever is no date, the
/// 31st of April for one, does not come back as it was.
std::optional<long long> isoMoment(std::string text) {
  constexpr std::string_view kMidnight = "0000-00-00T00:00:00Z";
  constexpr std::size_t kDateLength = 10;
  constexpr std::size_t kMinuteLength = 16;
  if (!text.empty() && text.back() == 'Z') text.pop_back();
  const std::size_t length = text.size();
  const bool isWhole =
      length == kDateLength || length == kMinuteLength || length == kMidnight.size() - 1;
  if (!isWhole) return {};
  text += kMidnight.substr(length);
  if (text[kDateLength] == ' ') text[kDateLength] = 'T';
  const Date date{digitsAt(text, 0, 4), digitsAt(text, 5, 2), digitsAt(text, 8, 2)};
  if (date.year < 1970) return {};
  const long long seconds = daysUntil(date) * kDay + digitsAt(text, 11, 2) * kHour +
                            digitsAt(text, 14, 2) * kMinute + digitsAt(text, 17, 2);
  return isoTime(seconds) == text ? std::optional<long long>(seconds) : std::nullopt;
}

/// 0 for a letter that is no unit's.
long long secondsOf(char unit) {
  if (unit == 'w') return kWeek;
  for (const Unit& known : kUnits) {
    if (known.letter == unit) return known.seconds;
  }
  return 0;
}

/// The sum of "1h", "30m" and so on, blanks between them allowed.
std::optional<long long> durationIn(const std::string& text) {
  constexpr long long kLongest = kDay * 366 * 100;
  long long sum = 0;
  const char* at = text.data();
  const char* const end = at + text.size();
  while (at != end) {
    long long amount = 0;
    const auto [unit, error] = std::from_chars(at, end, amount);
    const long long seconds = error == std::errc() && unit != end ? secondsOf(*unit) : 0;
    if (seconds == 0 || amount < 0 || amount > (kLongest - sum) / seconds) return {};
    sum += amount * seconds;
    at = unit + 1;
    while (at != end && *at == ' ') ++at;
  }
  return text.empty() ? std::nullopt : std::optional<long long>(sum);
}

}  // namespace

std::string isoTime(long long seconds) {
  constexpr long long kLast = 253402300799;  // 9999-12-31T23:59:59Z
  if (seconds < 0 || seconds > kLast) return {};

  const Date date = dateOf(seconds / kDay);
  const long long rest = seconds % kDay;
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%04lld-%02d-%02dT%02lld:%02lld:%02lldZ", date.year,
                date.month, date.day, rest / kHour, rest % kHour / kMinute, rest % kMinute);
  return text.data();
}

std::string duration(long long seconds) {
  for (std::size_t i = 0; i + 1 < kUnits.size(); ++i) {
    if (seconds < kUnits[i].seconds) continue;
    const long long rest = seconds % kUnits[i].seconds;
    const bool isWhole = rest / kUnits[i + 1].seconds == 0;
    return amount(seconds, kUnits[i]) + (isWhole ? "" : " " + amount(rest, kUnits[i + 1]));
  }
  return amount(seconds, kUnits.back());
}

std::optional<long long> momentIn(const std::string& text, long long now) {
  if (const auto moment = isoMoment(text)) return moment;
  const auto ago = durationIn(text);
  return ago ? std::optional<long long>(now - *ago) : std::nullopt;
}

}  // namespace tool

#include "tools/keldoauth/console/clock.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <ctime>

namespace tool {
namespace {

constexpr long long kMinute = 60;
constexpr long long kHour = 60 * kMinute;
constexpr long long kDay = 24 * kHour;

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

struct Unit {
  long long seconds;
  char letter;
};
constexpr std::array<Unit, 4> kUnits{{{kDay, 'd'}, {kHour, 'h'}, {kMinute, 'm'}, {1, 's'}}};

std::string amount(long long seconds, const Unit& unit) {
  return std::to_string(seconds / unit.seconds) + unit.letter;
}

}  // namespace

long long currentTime() {
  return static_cast<long long>(std::time(nullptr));
}

long long numberIn(const Json::Value& text) {
  if (text.isIntegral()) return text.asInt64();
  return text.isString() ? std::strtoll(text.asCString(), nullptr, 10) : 0;
}

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

}  // namespace tool

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/TimeArgument.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstddef>
#include <ctime>
#include <string>
#include <system_error>

namespace tonewerk {
namespace {

// Reads a text from its beginning. After one failure everything fails.
class Scanner {
 public:
  explicit Scanner(std::string_view text) : rest_(text) {}

  // Reads exactly `digits` digits.
  int number(std::size_t digits) {
    int value = 0;
    if (rest_.size() < digits) return fail();
    for (std::size_t at = 0; at < digits; ++at) {
      if (!isDigit(rest_[at])) return fail();
      value = value * 10 + (rest_[at] - '0');
    }
    rest_.remove_prefix(digits);
    return value;
  }
  // Reads one of these characters; 0 when there is none.
  char anyOf(std::string_view characters) {
    if (rest_.empty() || characters.find(rest_.front()) == std::string_view::npos)
      return static_cast<char>(fail());
    const char found = rest_.front();
    rest_.remove_prefix(1);
    return found;
  }
  // Reads a fraction such as ".5", or nothing.
  double fraction() {
    if (rest_.empty() || rest_.front() != '.') return 0.0;
    rest_.remove_prefix(1);
    double value = 0.0;
    double unit = 0.1;
    if (rest_.empty() || !isDigit(rest_.front())) return fail();
    for (; !rest_.empty() && isDigit(rest_.front()); rest_.remove_prefix(1), unit /= 10) {
      value += unit * (rest_.front() - '0');
    }
    return value;
  }
  // Reads `word` if it is next.
  bool skip(std::string_view word) {
    if (!rest_.starts_with(word)) return false;
    rest_.remove_prefix(word.size());
    return true;
  }
  bool isDone() const { return fits_ && rest_.empty(); }

 private:
  static bool isDigit(char c) { return c >= '0' && c <= '9'; }
  int fail() {
    fits_ = false;
    rest_ = {};
    return 0;
  }

  std::string_view rest_;
  bool fits_ = true;
};

struct Day {
  int year = 1970;
  int month = 1;
  int day = 1;
};

struct TimeOfDay {
  int hour = 0;
  int minute = 0;
  int second = 0;
  double fraction = 0.0;
};

std::chrono::year_month_day calendarDay(const Day& day) {
  return {std::chrono::year(day.year), std::chrono::month(static_cast<unsigned>(day.month)),
          std::chrono::day(static_cast<unsigned>(day.day))};
}

// In the zone of this process. The day of the month may be 0 or one too great. A time that the clock leaves
// out in spring is the one an hour later.
std::optional<double> localTime(const Day& day, const TimeOfDay& time) {
  std::tm fields{};
  fields.tm_year = day.year - 1900;
  fields.tm_mon = day.month - 1;
  fields.tm_mday = day.day;
  fields.tm_hour = time.hour;
  fields.tm_min = time.minute;
  fields.tm_sec = time.second;
  fields.tm_isdst = -1;  // not known
  fields.tm_wday = -1;   // stays so after a failure
  const std::time_t seconds = std::mktime(&fields);
  if (fields.tm_wday < 0) return std::nullopt;
  return static_cast<double>(seconds) + time.fraction;
}

double timeAtOffset(const Day& day, const TimeOfDay& time, int offsetMinutes) {
  const auto days = std::chrono::sys_days(calendarDay(day)).time_since_epoch().count();
  return static_cast<double>(days) * 86'400.0 + time.hour * 3600.0 + (time.minute - offsetMinutes) * 60.0 +
         time.second + time.fraction;
}

Day today(double now) {
  const auto seconds = static_cast<std::time_t>(now);
  std::tm fields{};
  localtime_r(&seconds, &fields);
  return {fields.tm_year + 1900, fields.tm_mon + 1, fields.tm_mday};
}

Day readDay(Scanner& scanner) {
  Day day;
  day.year = scanner.number(4);
  scanner.anyOf("-");
  day.month = scanner.number(2);
  scanner.anyOf("-");
  day.day = scanner.number(2);
  return day;
}

TimeOfDay readTimeOfDay(Scanner& scanner) {
  TimeOfDay time;
  time.hour = scanner.number(2);
  scanner.anyOf(":");
  time.minute = scanner.number(2);
  if (!scanner.skip(":")) return time;
  time.second = scanner.number(2);
  time.fraction = scanner.fraction();
  return time;
}

// Second 60 is a leap second.
bool exists(const TimeOfDay& time) { return time.hour <= 23 && time.minute <= 59 && time.second <= 60; }

// In minutes. None when an impossible offset is next.
std::optional<int> readOffset(Scanner& scanner) {
  if (scanner.skip("Z") || scanner.skip("z") || scanner.skip(" UTC")) return 0;
  const char sign = scanner.anyOf("+-");
  const int hours = scanner.number(2);
  scanner.anyOf(":");
  const int minutes = scanner.number(2);
  if (hours > 23 || minutes > 59) return std::nullopt;
  return (sign == '-' ? -1 : 1) * (hours * 60 + minutes);
}

std::optional<double> calendarTime(std::string_view text, double now) {
  Scanner scanner(text);
  constexpr std::size_t kYearDigits = 4;
  const bool hasDay = text.size() > kYearDigits && text[kYearDigits] == '-';
  const Day day = hasDay ? readDay(scanner) : today(now);
  if (!calendarDay(day).ok()) return std::nullopt;
  if (hasDay && scanner.isDone()) return localTime(day, {});
  if (hasDay) scanner.anyOf("Tt ");
  const TimeOfDay time = readTimeOfDay(scanner);
  if (!exists(time)) return std::nullopt;
  if (scanner.isDone()) return localTime(day, time);
  const std::optional<int> offset = readOffset(scanner);
  if (!hasDay || !offset || !scanner.isDone()) return std::nullopt;
  return timeAtOffset(day, time, *offset);
}

std::optional<double> namedTime(std::string_view text, double now) {
  if (text == "now") return now;
  Day day = today(now);
  if (text == "yesterday") {
    --day.day;
  } else if (text == "tomorrow") {
    ++day.day;
  } else if (text != "today") {
    return std::nullopt;
  }
  return localTime(day, {});
}

// Seconds of a unit of time; 0 for any other word.
double unitSeconds(std::string_view word) {
  struct Unit {
    std::array<std::string_view, 5> names;
    double seconds;
  };
  // A month is a twelfth of a year of 365.25 days.
  static constexpr std::array kUnits = {
      Unit{{"ms", "msec", "msec", "msec", "msec"}, 0.001},
      Unit{{"s", "sec", "secs", "second", "seconds"}, 1.0},
      Unit{{"m", "min", "mins", "minute", "minutes"}, 60.0},
      Unit{{"h", "hr", "hrs", "hour", "hours"}, 3600.0},
      Unit{{"d", "day", "days", "days", "days"}, 86'400.0},
      Unit{{"w", "week", "weeks", "weeks", "weeks"}, 604'800.0},
      Unit{{"M", "month", "months", "months", "months"}, 2'629'800.0},
      Unit{{"y", "year", "years", "years", "years"}, 31'557'600.0},
  };
  for (const Unit& unit : kUnits) {
    for (const std::string_view name : unit.names)
      if (word == name) return unit.seconds;
  }
  return 0.0;
}

void skipSpaces(std::string_view& text) {
  text.remove_prefix(std::min(text.find_first_not_of(' '), text.size()));
}

// Reads numbers with units, such as "2h 30min", from the text's beginning.
std::optional<double> takeSpan(std::string_view& text) {
  double seconds = 0.0;
  do {
    double amount = 0.0;
    const auto [end, error] =
        std::from_chars(text.data(), text.data() + text.size(), amount, std::chars_format::fixed);
    if (error != std::errc() || !std::isfinite(amount) || amount < 0) return std::nullopt;
    text.remove_prefix(static_cast<std::size_t>(end - text.data()));
    skipSpaces(text);
    const std::string_view word = text.substr(0, text.find_first_of(" 0123456789."));
    const double unit = unitSeconds(word);
    if (unit == 0.0) return std::nullopt;
    seconds += amount * unit;
    text.remove_prefix(word.size());
    skipSpaces(text);
  } while (!text.empty() && text != "ago");
  return seconds;
}

std::optional<double> relativeTime(std::string_view text, double now) {
  const bool isLater = text.starts_with('+');
  const bool hasSign = isLater || text.starts_with('-');
  if (hasSign) text.remove_prefix(1);
  const std::optional<double> span = takeSpan(text);
  if (!span || !std::isfinite(*span) || (hasSign && !text.empty())) return std::nullopt;
  return isLater ? now + *span : now - *span;
}

std::optional<double> secondsSince1970(std::string_view text) {
  if (!text.starts_with('@')) return std::nullopt;
  double seconds = 0.0;
  const char* const end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data() + 1, end, seconds, std::chars_format::fixed);
  if (error != std::errc() || rest != end || !std::isfinite(seconds)) return std::nullopt;
  return seconds;
}

}  // namespace

std::optional<double> timeOfArgument(std::string_view text, double now) {
  if (const auto named = namedTime(text, now)) return named;
  if (const auto seconds = secondsSince1970(text)) return seconds;
  if (const auto relative = relativeTime(text, now)) return relative;
  return calendarTime(text, now);
}

}  // namespace tonewerk

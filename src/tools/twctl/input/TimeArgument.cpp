// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/TimeArgument.h"

#include <charconv>
#include <chrono>
#include <cmath>
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

std::optional<double> absoluteTime(std::string_view text) {
  Scanner scanner(text);
  const int year = scanner.number(4);
  scanner.anyOf("-");
  const int month = scanner.number(2);
  scanner.anyOf("-");
  const int day = scanner.number(2);
  scanner.anyOf("Tt ");
  const int hour = scanner.number(2);
  scanner.anyOf(":");
  const int minute = scanner.number(2);
  scanner.anyOf(":");
  const int second = scanner.number(2);
  const double fraction = scanner.fraction();
  const char zone = scanner.anyOf("Zz+-");
  int offset = 0;  // minutes
  if (zone == '+' || zone == '-') {
    const int hours = scanner.number(2);
    scanner.anyOf(":");
    const int minutes = scanner.number(2);
    if (hours > 23 || minutes > 59) return std::nullopt;
    offset = (zone == '-' ? -1 : 1) * (hours * 60 + minutes);
  }
  const std::chrono::year_month_day date{std::chrono::year(year),
                                         std::chrono::month(static_cast<unsigned>(month)),
                                         std::chrono::day(static_cast<unsigned>(day))};
  // Second 60 is a leap second.
  if (!scanner.isDone() || !date.ok() || hour > 23 || minute > 59 || second > 60) return std::nullopt;
  const auto days = std::chrono::sys_days(date).time_since_epoch().count();
  return static_cast<double>(days) * 86'400.0 + hour * 3600.0 + (minute - offset) * 60.0 + second + fraction;
}

std::optional<double> timeAgo(std::string_view text, double now) {
  double amount = 0.0;
  const char* end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data(), end, amount, std::chars_format::fixed);
  if (error != std::errc() || end - rest != 1 || !std::isfinite(amount) || amount < 0) return std::nullopt;
  switch (*rest) {
    case 's':
      return now - amount;
    case 'm':
      return now - amount * 60.0;
    case 'h':
      return now - amount * 3600.0;
    case 'd':
      return now - amount * 86'400.0;
    default:
      return std::nullopt;
  }
}

}  // namespace

std::optional<double> timeOfArgument(std::string_view text, double now) {
  const std::optional<double> ago = timeAgo(text, now);
  return ago ? ago : absoluteTime(text);
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "values/Conversions.h"

#include <charconv>
#include <cmath>
#include <cstdlib>
#include <limits>
#include <string>
#include <system_error>

namespace tonewerk {
namespace {

bool isDigit(char c) { return c >= '0' && c <= '9'; }
bool isSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

// The characters at the start of a text that form a decimal number: sign, digits, fraction, exponent.
struct LeadingNumber {
  std::string_view text;  // without leading spaces and plus sign; empty when there is no digit
  bool isWhole = true;    // has neither a fraction nor an exponent
};

LeadingNumber leadingNumber(std::string_view text) {
  std::size_t at = 0;
  while (at < text.size() && isSpace(text[at])) ++at;
  std::size_t start = at;
  if (at < text.size() && (text[at] == '+' || text[at] == '-')) {
    if (text[at++] == '+') ++start;
  }
  const auto digits = [&] {
    const std::size_t from = at;
    while (at < text.size() && isDigit(text[at])) ++at;
    return at - from;
  };
  LeadingNumber number;
  std::size_t count = digits();
  if (at < text.size() && text[at] == '.') {
    const std::size_t point = at++;
    const std::size_t fraction = digits();
    number.isWhole = false;
    if (count + fraction == 0) at = point;
    count += fraction;
  }
  if (count == 0) return {};
  if (at < text.size() && (text[at] == 'e' || text[at] == 'E')) {
    const std::size_t exponent = at++;
    if (at < text.size() && (text[at] == '+' || text[at] == '-')) ++at;
    if (digits() == 0) {
      at = exponent;
    } else {
      number.isWhole = false;
    }
  }
  number.text = text.substr(start, at - start);
  return number;
}

double doubleOf(std::string_view digits) {
  double result = 0.0;
  const auto parsed = std::from_chars(digits.data(), digits.data() + digits.size(), result);
  if (parsed.ec != std::errc::result_out_of_range) return result;
  // The number is too large or too small for a double. from_chars does not say which; strtod does.
  return std::strtod(std::string(digits).c_str(), nullptr);
}

}  // namespace

std::int64_t saturatedInteger(double number) {
  constexpr double kTwoTo63 = 9223372036854775808.0;
  if (std::isnan(number)) return 0;
  if (number >= kTwoTo63) return std::numeric_limits<std::int64_t>::max();
  if (number < -kTwoTo63) return std::numeric_limits<std::int64_t>::min();
  return static_cast<std::int64_t>(number);
}

double numberOfText(std::string_view text) {
  const LeadingNumber number = leadingNumber(text);
  return number.text.empty() ? 0.0 : doubleOf(number.text);
}

std::int64_t integerOfText(std::string_view text) {
  const LeadingNumber number = leadingNumber(text);
  if (number.text.empty()) return 0;
  if (!number.isWhole) return saturatedInteger(doubleOf(number.text));
  std::int64_t result = 0;
  const auto parsed = std::from_chars(number.text.data(), number.text.data() + number.text.size(), result);
  if (parsed.ec == std::errc()) return result;
  return number.text.front() == '-' ? std::numeric_limits<std::int64_t>::min()
                                    : std::numeric_limits<std::int64_t>::max();
}

bool booleanOfText(std::string_view text) {
  if (text.empty()) return false;
  const char first = text.front();
  if (first == 'Y' || first == 'y' || first == 'T' || first == 't') return true;
  return numberOfText(text) != 0.0;
}

}  // namespace tonewerk

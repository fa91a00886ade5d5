// SPDX-License-Identifier: Apache-2.0
#include "values/Decimal.h"

#include <bit>
#include <charconv>
#include <cmath>
#include <cstdint>

namespace tonewerk {
namespace {

constexpr std::uint64_t kMillion = 1'000'000;
constexpr std::uint64_t kTenMillion = 10'000'000;

char* withFraction(std::uint64_t whole, std::uint64_t fraction, int digits, char* to) {
  char* const point = std::to_chars(to, to + kMaxDigits, whole).ptr;
  *point = '.';
  for (int at = digits; at > 0; --at, fraction /= 10) point[at] = static_cast<char>('0' + fraction % 10);
  char* end = point + digits;
  while (*end == '0') --end;
  return end + 1;
}

// Below 2^33, neighbouring doubles are closer to each other than two numbers of six decimal places. So at
// most one of those numbers reads back as `size`, and no number with fewer digits does.
char* withSixPlaces(double size, char* to) {
  if (!(size < 8589934592.0)) return nullptr;
  const auto millionths = static_cast<std::uint64_t>(std::llrint(size * 1e6));
  if (static_cast<double>(millionths) / 1e6 != size) return nullptr;
  return withFraction(millionths / kMillion, millionths % kMillion, 6, to);
}

// For times of the years 1987 to 2106 that need a seventh place, in which case the nearest number of seven
// places is the answer: its distance is at most half of 1e-7, which is less than half of the distance of two
// doubles.
char* withSevenPlaces(double size, char* to) {
  constexpr int kMantissaBits = 52;
  const auto bits = std::bit_cast<std::uint64_t>(size);
  const int fractionBits = kMantissaBits + 1023 - static_cast<int>(bits >> kMantissaBits);
  if (fractionBits < 21 || fractionBits > 23) return nullptr;
  const std::uint64_t mantissa = (bits & ((std::uint64_t{1} << kMantissaBits) - 1)) | std::uint64_t{1}
                                                                                          << kMantissaBits;
  const std::uint64_t one = std::uint64_t{1} << fractionBits;
  const std::uint64_t scaled = (mantissa & (one - 1)) * kTenMillion;
  const std::uint64_t rest = scaled & (one - 1);
  const std::uint64_t fraction = (scaled >> fractionBits) + (rest > one / 2 ? 1 : 0);
  if (rest == one / 2 || fraction == kTenMillion) return nullptr;
  return withFraction(mantissa >> fractionBits, fraction, 7, to);
}

}  // namespace

char* digitsOf(double number, char* to) {
  const double size = std::fabs(number);
  const bool fixed = size == 0.0 || (size >= 1e-4 && size < 1e16);
  if (!fixed) return std::to_chars(to, to + kMaxDigits, number, std::chars_format::scientific).ptr;
  char* const digits = std::signbit(number) ? to + 1 : to;
  *to = '-';  // overwritten unless there is a sign
  if (size < 9007199254740992.0 && std::trunc(size) == size)
    return std::to_chars(digits, to + kMaxDigits, static_cast<std::uint64_t>(size)).ptr;
  // Most numbers of clients are times, or have few decimal places. Then this is several times faster than
  // to_chars(), which finds the shortest digits of any number.
  if (char* end = withSixPlaces(size, digits)) return end;
  if (char* end = withSevenPlaces(size, digits)) return end;
  return std::to_chars(to, to + kMaxDigits, number, std::chars_format::fixed).ptr;
}

}  // namespace tonewerk

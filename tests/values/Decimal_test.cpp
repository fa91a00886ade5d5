// SPDX-License-Identifier: Apache-2.0
#include "values/Decimal.h"

#include <bit>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <gtest/gtest.h>
#include <random>
#include <string>

namespace tonewerk {
namespace {

constexpr std::uint64_t kSeed = 20261122;
constexpr int kNumbers = 200'000;

std::string digits(double number) {
  char text[kMaxDigits];
  return {text, digitsOf(number, text)};
}

// What the library finds, which looks for the shortest digits of any number.
std::string shortest(double number) {
  const double size = std::fabs(number);
  const bool fixed = size == 0.0 || (size >= 1e-4 && size < 1e16);
  char text[64];
  const auto format = fixed ? std::chars_format::fixed : std::chars_format::scientific;
  return {text, std::to_chars(text, text + sizeof(text), number, format).ptr};
}

void expectShortest(double number) {
  ASSERT_EQ(digits(number), shortest(number)) << "seed " << kSeed;
  ASSERT_EQ(digits(-number), shortest(-number)) << "seed " << kSeed;
}

TEST(DecimalTest, WritesTheShortestDigitsOfTimes) {
  std::mt19937_64 random(kSeed);
  std::uniform_real_distribution<double> anyTime(0.0, 5e9);
  for (int at = 0; at < kNumbers; ++at) {
    const double time = anyTime(random);
    expectShortest(time);
    expectShortest(std::round(time * 1e6) / 1e6);
    expectShortest(std::round(time * 1e7) / 1e7);
    expectShortest(std::round(time * 256) / 256);
  }
}

TEST(DecimalTest, WritesTheShortestDigitsOfNumbersWithFewPlaces) {
  std::mt19937_64 random(kSeed);
  for (int at = 0; at < kNumbers; ++at) {
    const double number = static_cast<double>(random() >> (random() % 64));
    for (const double divisor : {1.0, 10.0, 100.0, 1e3, 1e4, 1e5, 1e6, 1e7, 1e8, 1024.0})
      expectShortest(number / divisor);
  }
}

TEST(DecimalTest, WritesTheShortestDigitsOfAnyNumber) {
  std::mt19937_64 random(kSeed);
  for (int at = 0; at < kNumbers; ++at) {
    const double number = std::bit_cast<double>(random());
    if (std::isfinite(number)) expectShortest(number);
  }
}

TEST(DecimalTest, WritesTheShortestDigitsAtTheEdges) {
  for (const double edge :
       {0.0, 1e-4, 1e16, 9007199254740992.0, 8589934592.0, 536870912.0, 4294967296.0, 0.5, 1.0, 0.1}) {
    double below = edge;
    double above = edge;
    for (int steps = 0; steps < 1000; ++steps) {
      expectShortest(below);
      expectShortest(above);
      below = std::nextafter(below, -1e300);
      above = std::nextafter(above, 1e300);
    }
  }
}

}  // namespace
}  // namespace tonewerk

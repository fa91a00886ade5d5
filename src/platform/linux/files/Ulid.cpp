// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/Ulid.h"

#include <algorithm>
#include <memory>
#include <random>

namespace tonewerk {
namespace {

constexpr char kDigits[] = "0123456789ABCDEFGHJKMNPQRSTVWXYZ";
constexpr int kTimeDigits = 10;
constexpr std::uint64_t kMaxMilliseconds = (std::uint64_t{1} << 48) - 1;

std::uint64_t millisecondsOf(double seconds) {
  if (!(seconds > 0.0)) return 0;
  return static_cast<std::uint64_t>(std::min(seconds * 1000.0, static_cast<double>(kMaxMilliseconds)));
}

UlidGenerator::Random systemRandom() {
  const auto device = std::make_shared<std::random_device>();
  return [device] { return (*device)(); };
}

}  // namespace

UlidGenerator::UlidGenerator() : UlidGenerator(systemRandom()) {}

std::string UlidGenerator::next(double now) {
  const std::uint64_t milliseconds = millisecondsOf(now);
  if (milliseconds > milliseconds_) {
    milliseconds_ = milliseconds;
    for (std::uint8_t& byte : tail_) byte = static_cast<std::uint8_t>(random_());
    tail_[0] &= 0x7F;  // room to count up in
  } else {
    for (std::size_t at = tail_.size(); at-- > 0 && ++tail_[at] == 0;) {
    }
  }
  std::string text(26, '0');
  for (int digit = 0; digit < kTimeDigits; ++digit) {
    text[static_cast<std::size_t>(kTimeDigits - 1 - digit)] = kDigits[milliseconds_ >> (5 * digit) & 31];
  }
  // 80 random bits are 16 digits of five bits each.
  for (std::size_t digit = 0; digit < 16; ++digit) {
    const std::size_t bit = digit * 5;
    const unsigned high = tail_[bit / 8];
    const unsigned low = bit / 8 + 1 < tail_.size() ? tail_[bit / 8 + 1] : 0U;
    text[kTimeDigits + digit] = kDigits[(high << 8 | low) >> (11 - bit % 8) & 31];
  }
  return text;
}

}  // namespace tonewerk

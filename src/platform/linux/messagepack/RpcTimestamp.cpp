// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcTimestamp.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>

#include "values/EncodedValue.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kNanosecondsPerSecond = 1'000'000'000;
constexpr unsigned kSecondsBits = 34;  // of the 8-byte form; nanoseconds have the other 30

void appendBigEndian(std::string& out, std::uint64_t number, std::size_t bytes) {
  for (std::size_t left = bytes; left > 0; --left)
    out += static_cast<char>(number >> (8 * (left - 1)) & 0xFFU);
}

std::int64_t saturated(double seconds) {
  constexpr double kTwoTo63 = 9223372036854775808.0;
  if (seconds >= kTwoTo63) return std::numeric_limits<std::int64_t>::max();
  if (seconds < -kTwoTo63) return std::numeric_limits<std::int64_t>::min();
  return static_cast<std::int64_t>(seconds);
}

}  // namespace

std::optional<Date> dateOfTimestamp(std::string_view body) { return encoding::dateOf(body); }

std::string timestampOf(Date date) {
  const double whole = std::isnan(date.seconds) ? 0.0 : std::floor(date.seconds);
  std::int64_t seconds = saturated(whole);
  std::uint64_t nanoseconds = 0;
  if (std::isfinite(date.seconds)) {
    nanoseconds = static_cast<std::uint64_t>(std::llround((date.seconds - whole) * 1e9));
  }
  if (nanoseconds >= kNanosecondsPerSecond) {  // a fraction that rounds up to a whole second
    nanoseconds -= kNanosecondsPerSecond;
    ++seconds;
  }
  std::string body;
  const auto bits = static_cast<std::uint64_t>(seconds);
  if (nanoseconds == 0 && bits <= std::numeric_limits<std::uint32_t>::max()) {
    appendBigEndian(body, bits, 4);
  } else if (bits >> kSecondsBits == 0) {
    appendBigEndian(body, nanoseconds << kSecondsBits | bits, 8);
  } else {
    appendBigEndian(body, nanoseconds, 4);
    appendBigEndian(body, bits, 8);
  }
  return body;
}

}  // namespace tonewerk

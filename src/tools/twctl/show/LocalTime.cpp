// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/LocalTime.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "values/Date.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kHour = 3600;

long offsetAt(std::int64_t time) {
  const auto seconds = static_cast<std::time_t>(time);
  std::tm parts{};
  return localtime_r(&seconds, &parts) == nullptr ? 0 : parts.tm_gmtoff;
}

// Whether the clock has shown, or will show, the same at another time.
bool comesTwice(std::int64_t time, long offset) {
  // The clock changes by less, and not twice within it.
  constexpr std::int64_t kAround = 12 * kHour;
  return std::ranges::any_of(std::array{offsetAt(time - kAround), offsetAt(time + kAround)}, [&](long other) {
    return other != offset && offsetAt(time + offset - other) == other;
  });
}

std::string offsetText(long seconds) {
  constexpr long kMinute = 60;
  const long minutes = std::labs(seconds) / kMinute;
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%c%02ld:%02ld", seconds < 0 ? '-' : '+', minutes / kMinute,
                minutes % kMinute);
  return text.data();
}

std::string timeText(double seconds, bool hasMilliseconds) {
  // Only years of four digits can be told; textOf() finds the nearest one.
  constexpr double kYear10000 = 253'402'300'800.0;
  constexpr double kDay = 86'400.0;
  if (!(seconds > kDay - 62'167'219'200.0 && seconds < kYear10000 - kDay)) return textOf(Date{seconds});
  constexpr double kPerSecond = 1000.0;
  const auto milliseconds = static_cast<std::int64_t>(std::floor(seconds * kPerSecond));
  const auto whole = static_cast<std::int64_t>(std::floor(seconds));
  const auto time = static_cast<std::time_t>(whole);
  std::tm parts{};
  std::array<char, 40> text{};
  if (localtime_r(&time, &parts) == nullptr) return textOf(Date{seconds});
  const std::size_t length = std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M:%S", &parts);
  std::string shown(text.data(), length);
  const auto fraction = static_cast<int>(std::clamp<std::int64_t>(milliseconds - whole * 1000, 0, 999));
  if (hasMilliseconds && fraction > 0) {
    std::snprintf(text.data(), text.size(), ".%03d", fraction);
    shown += text.data();
  }
  if (comesTwice(whole, parts.tm_gmtoff)) return shown + offsetText(parts.tm_gmtoff);
  return parts.tm_gmtoff == 0 && std::strcmp(parts.tm_zone, "UTC") == 0 ? shown + "Z" : shown;
}

}  // namespace

std::string localTime(double seconds) { return timeText(seconds, true); }

std::string localSecond(double seconds) { return timeText(seconds, false); }

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "session/LocalTime.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>

namespace tonewerk {

std::string localTimeText(double now, std::chrono::minutes utcOffset) {
  const std::chrono::sys_seconds utc{std::chrono::seconds(static_cast<std::int64_t>(std::floor(now)))};
  const auto local = utc + utcOffset;
  const auto day = std::chrono::floor<std::chrono::days>(local);
  const std::chrono::year_month_day date{day};
  const std::chrono::hh_mm_ss time{local - day};
  const int offset = static_cast<int>(utcOffset.count());
  char text[96];
  std::snprintf(text, sizeof(text), "%04d%02u%02u-%02d%02d%02d%c%02d%02d", static_cast<int>(date.year()),
                static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
                static_cast<int>(time.hours().count()), static_cast<int>(time.minutes().count()),
                static_cast<int>(time.seconds().count()), offset < 0 ? '-' : '+', std::abs(offset) / 60,
                std::abs(offset) % 60);
  return text;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "values/Date.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>

namespace tonewerk {

std::string textOf(Date date) {
  constexpr double kFirst = -62167219200.0;  // 0000-01-01T00:00:00Z
  constexpr double kEnd =
      253402300800.0;  // 10000-01-01T00:00:00Z; doubles near it are coarser than a microsecond
  const double seconds = std::isnan(date.seconds) ? 0.0 : std::clamp(date.seconds, kFirst, kEnd);

  // Computes seconds and microseconds separately: a double that holds a current date has no digits left for a
  // product of both.
  double whole = std::floor(seconds);
  double micros = std::round((seconds - whole) * 1e6);
  if (micros >= 1e6) {
    whole += 1.0;
    micros = 0.0;
  }
  if (whole >= kEnd) {
    whole = kEnd - 1.0;
    micros = 999999.0;
  }

  const std::chrono::sys_seconds time{std::chrono::seconds(static_cast<std::int64_t>(whole))};
  const auto day = std::chrono::floor<std::chrono::days>(time);
  const std::chrono::year_month_day calendar{day};
  const std::chrono::hh_mm_ss clock{time - day};
  char text[64];
  std::snprintf(text, sizeof(text), "%04d-%02u-%02uT%02d:%02d:%02d", static_cast<int>(calendar.year()),
                static_cast<unsigned>(calendar.month()), static_cast<unsigned>(calendar.day()),
                static_cast<int>(clock.hours().count()), static_cast<int>(clock.minutes().count()),
                static_cast<int>(clock.seconds().count()));
  std::string out = text;
  if (micros > 0) {
    std::snprintf(text, sizeof(text), ".%06d", static_cast<int>(micros));
    out += text;
    out.erase(out.find_last_not_of('0') + 1);
  }
  return out + "Z";
}

}  // namespace tonewerk

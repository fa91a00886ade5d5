// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// A point in time: seconds since 1970-01-01 00:00 UTC, leap seconds not counted.
struct Date {
  double seconds = 0.0;

  // By instant. NaN equals NaN, so that a value always equals its copy.
  friend bool operator==(Date a, Date b) {
    return a.seconds == b.seconds || (a.seconds != a.seconds && b.seconds != b.seconds);
  }
};

// RFC 3339 in UTC with up to six fraction digits, as "2026-11-20T10:18:00.5Z". What that form cannot say
// (years outside 0000 to 9999, NaN) reads as the nearest date it can say, NaN as 1970.
std::string textOf(Date date);

}  // namespace tonewerk

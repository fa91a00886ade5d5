// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// A point in time: seconds since 1970-01-01 00:00 UTC, leap seconds not counted.
struct Date {
  double seconds = 0.0;

  // Compares instants. NaN equals NaN, so that a value always equals its copy.
  friend bool operator==(Date a, Date b) {
    return a.seconds == b.seconds || (a.seconds != a.seconds && b.seconds != b.seconds);
  }
};

// Returns the date as RFC 3339 in UTC with up to six fraction digits, such as "2026-11-20T10:18:00.5Z". A
// date that this form cannot express (a year outside 0000 to 9999) becomes the nearest date that it can
// express; NaN becomes 1970.
std::string textOf(Date date);

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "values/Value.h"

namespace tonewerk {

// Values in a recording. JSON has no dates and no numbers that are not finite, and a recording needs the
// time of playing. These are maps with one entry; every other map stands for itself:
//
//   {"now": offset}     the time of playing plus the offset, a number in seconds since 1970
//   {"date": seconds}   a date; in place of the number also "nan", "inf" or "-inf"
//   {"number": "nan"}   a number that is not finite: "nan", "inf" or "-inf"
//   {"map": {...}}      a map that would stand for something else

// Returns the value that `recorded` stands for when it is played at `now`, in seconds since 1970.
Value playedValue(const Value& recorded, double now);

// Returns what stands for `value`, whenever it is played.
Value recordedValue(const Value& value);

}  // namespace tonewerk

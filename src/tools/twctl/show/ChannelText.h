// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "values/Value.h"

namespace tonewerk {

class ChanmeterSample;

// A channel's value for people, in one line: "12", "0-10: 5, 10-100: 2 (3 to 60)" or "on: 200 (50 %)".
// Buckets without hits and states without time and transitions are left out; "-" when none is left.
std::string channelValueText(const ChanmeterSample& sample);

// A channel for programs: its driver and the fields of docs/driver-channels.md. The field "format" is a
// number when the format is unknown.
ValueMap channelFields(const ChanmeterSample& sample);

// True when a sample that is a difference of two shows a change.
bool isChanged(const ChanmeterSample& sample);

}  // namespace tonewerk

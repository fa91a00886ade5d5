// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "values/Value.h"

namespace tonewerk {

class ChanmeterSample;

// A channel's value for people, in one line: "12", "7 hits: 0-10: 5, 10-100: 2" or "on: 200 (50 %)". Buckets
// and states in which nothing happened are left out; "-" when nothing did.
std::string channelValueText(const ChanmeterSample& sample);

// A channel for programs: the fields of docs/driver-channels.md and its driver. Of a format without values
// the format's number stands for them.
ValueMap channelFields(const ChanmeterSample& sample);

// Whether anything happened, if the sample is a change.
bool isChanged(const ChanmeterSample& sample);

}  // namespace tonewerk

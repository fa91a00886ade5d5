// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

class ValueMap;

// A message's payload in one line, such as "play_seconds=0.75 QMSessionVolume=0.5 active_devices=Speaker".
// What people look for comes first. What the core has added to each message, and what says that it knows
// nothing, is left out; so are keys beyond the first eight, which "…" shows. Numbers have at most three
// decimals. Not safe for a terminal yet.
std::string keysThatMatter(const ValueMap& payload);

}  // namespace tonewerk

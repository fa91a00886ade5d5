// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/Kolvi.h"

namespace tonewerk {

// The probe dictionaries that a probe list holds: an array's elements, or the one map that it is. None for
// any other root.
std::optional<ValueArray> probeDictionariesOf(const Value& root);

// The signposts whose intervals the dictionaries and their children ask for.
std::set<std::string> signpostsOf(const ValueArray& dictionaries);

// What KolviModel::makeProbes() promises, over whatever knows a signpost's intervals.
std::vector<KolviProbe> makeKolviProbes(
    const ValueArray& dictionaries,
    const std::function<std::vector<KolviEvent>(const std::string& signpost)>& eventsOf);

}  // namespace tonewerk

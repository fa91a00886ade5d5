// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "values/ValueArray.h"

namespace tonewerk {

// Counts and times of one node, for people who look for the one that is slow.
struct NodeLoad {
  std::string name;
  std::int32_t process = 0;        // identifier, 0 unknown
  std::int64_t busyPerMille = 0;   // mean share of the period in the last report, about a second
  std::int64_t worstPerMille = 0;  // worst share of the last minute
  std::int64_t glitches = 0;       // that it caused
};

// Appends four channels for each node, in the group "Nodes" and a subgroup of its name. Nodes of the same
// name share theirs.
void appendNodeChannels(ValueArray& channels, const std::vector<NodeLoad>& nodes);

}  // namespace tonewerk

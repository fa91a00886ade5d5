// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/NodeChannels.h"

#include <algorithm>
#include <map>
#include <string_view>
#include <utility>

#include "values/Value.h"
#include "values/ValueMap.h"

namespace tonewerk {

void appendNodeChannels(ValueArray& channels, const std::vector<NodeLoad>& nodes) {
  std::map<std::string_view, NodeLoad> byName;
  for (const NodeLoad& node : nodes) {
    const auto [known, isNew] = byName.try_emplace(node.name, node);
    if (isNew) continue;
    known->second.busyPerMille += node.busyPerMille;
    known->second.worstPerMille = std::max(known->second.worstPerMille, node.worstPerMille);
    known->second.glitches += node.glitches;
  }
  for (const auto& entry : byName) {
    const NodeLoad& node = entry.second;
    const auto append = [&](std::string_view channel, std::string_view unit, std::int64_t value) {
      channels.append(ValueMap{{"group", "Nodes"},
                               {"subgroup", node.name},
                               {"name", channel},
                               {"unit", unit},
                               {"format", "simple"},
                               {"value", value}});
    };
    append("Busy", "permille", node.busyPerMille);
    append("Worst", "permille", node.worstPerMille);
    append("Glitches", "glitches", node.glitches);
    append("PID", "", node.process);
  }
}

}  // namespace tonewerk

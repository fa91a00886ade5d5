// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/WatchedSessions.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "protocol/WatchKeys.h"

namespace tonewerk {

std::optional<std::vector<ValueMap>> readWatchedSessions(
    const std::function<std::optional<Value>(const Arguments&)>& ask) {
  std::vector<ValueMap> sessions;
  for (std::size_t total = 1; sessions.size() < total;) {
    const std::optional<Value> answer = ask(Arguments{Value(sessions.size())});
    if (!answer) return std::nullopt;
    const ValueMap* portion = answer->asMap();
    const Value* list = portion == nullptr ? nullptr : portion->find(kWatchKeySessions);
    if (list == nullptr || list->asArray() == nullptr || list->asArray()->empty()) break;
    for (const Value& session : *list->asArray()) {
      if (session.asMap() != nullptr) sessions.push_back(*session.asMap());
    }
    total = static_cast<std::size_t>(std::max<std::int64_t>(portion->integer(kWatchKeyTotal), 0));
  }
  return sessions;
}

}  // namespace tonewerk

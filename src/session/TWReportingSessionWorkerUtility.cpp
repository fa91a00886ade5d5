// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionWorkerUtility.h"

#include <algorithm>

namespace tonewerk {

TWReportingSessionMessages TWReportingSessionWorkerUtility::combineRapidMessages(
    const TWReportingSessionMessages& messages, std::span<const std::string_view> keysToCombine,
    double maximumPausetime) {
  TWReportingSessionMessages result;
  std::vector<std::string_view> seen;
  TWReportingSessionMessage* anchor = nullptr;
  for (const auto& message : messages) {
    const auto key =
        std::find_if(keysToCombine.begin(), keysToCombine.end(),
                     [&](std::string_view candidate) { return message->message.contains(candidate); });
    if (key == keysToCombine.end()) {
      result.push_back(message);
      continue;
    }
    if (std::find(seen.begin(), seen.end(), *key) != seen.end()) {
      seen.clear();
      anchor = nullptr;
    }
    seen.push_back(*key);
    if (anchor == nullptr) {
      anchor = message.get();
      result.push_back(message);
      continue;
    }
    // Each merge updates the anchor's time. A pause that is not a number does not count as short.
    if (message->epochTime() - anchor->epochTime() < maximumPausetime) {
      anchor->message.merge(message->message);
    } else {
      result.push_back(message);
    }
  }
  return result;
}

bool TWReportingSessionWorkerUtility::isVidroXYerrorMessage(const TWReportingSessionMessage& message) {
  return std::any_of(message.message.begin(), message.message.end(), [](const ValueMap::Entry& entry) {
    return entry.key.view().starts_with("vdac_invalid_");
  });
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionWorkerUtility.h"

#include <algorithm>

#include "session/ForEachMessage.h"
#include "session/KeySlots.h"
#include "session/ReasonTrace.h"
#include "values/ValueView.h"

namespace tonewerk {

std::vector<std::size_t> TWReportingSessionWorkerUtility::mergeRapidMessages(
    MessageRange messages, std::span<const std::string_view> keysToCombine, double maximumPausetime) {
  std::vector<std::size_t> merged;
  std::vector<std::string_view> seen;
  TWReportingSessionMessage* anchor = nullptr;
  KeySlots slots(keysToCombine);
  forEachMessage(messages, [&](std::size_t place, TWReportingSessionMessage& message) {
    if (!slots.mayHaveAny(message.message)) return;
    const auto key =
        std::find_if(keysToCombine.begin(), keysToCombine.end(),
                     [&](std::string_view candidate) { return message.message.contains(candidate); });
    if (key == keysToCombine.end()) return;
    if (std::find(seen.begin(), seen.end(), *key) != seen.end()) {
      seen.clear();
      anchor = nullptr;
    }
    seen.push_back(*key);
    if (anchor == nullptr) {
      anchor = &message;
      return;
    }
    // Each merge updates the anchor's time. A pause that is not a number does not count as short.
    const double pause = message.epochTime() - anchor->epochTime();
    const bool isRapid = pause < maximumPausetime;
    if (auto* reasons = ReasonTrace::current())
      reasons->rapidMessage({anchor->message, message.message, pause, maximumPausetime, isRapid});
    if (isRapid) {
      anchor->message.merge(message.message);
      merged.push_back(place);
    }
  });
  return merged;
}

TWReportingSessionMessages TWReportingSessionWorkerUtility::combineRapidMessages(
    const TWReportingSessionMessages& messages, std::span<const std::string_view> keysToCombine,
    double maximumPausetime) {
  TWReportingSessionMessages remaining = messages;
  const std::vector<std::size_t> merged = mergeRapidMessages(messages, keysToCombine, maximumPausetime);
  std::for_each(merged.begin(), merged.end(), [&](std::size_t place) { remaining[place] = nullptr; });
  std::erase(remaining, nullptr);
  return remaining;
}

bool TWReportingSessionWorkerUtility::isVidroXYerrorMessage(const TWReportingSessionMessage& message) {
  bool isError = false;
  message.message.forEach([&isError](const SharedString& key, ValueView) {
    isError = isError || key.view().starts_with("vdac_invalid_");
  });
  return isError;
}

}  // namespace tonewerk

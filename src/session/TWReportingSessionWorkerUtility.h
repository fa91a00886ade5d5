// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <span>
#include <string_view>
#include <vector>

#include "session/MessageRange.h"
#include "session/TWReportingSessionMessage.h"

namespace tonewerk {

// Functions that several workers use.
class TWReportingSessionWorkerUtility {
 public:
  // Merges each burst of messages that have one of `keysToCombine` into the burst's first message, whose
  // payload is changed in place. Returns the places of the messages that were merged, in order. A burst ends
  // when one of its keys comes again. A message that comes `maximumPausetime` seconds or more after the
  // last merged one is not merged, but does not end the burst.
  static std::vector<std::size_t> mergeRapidMessages(MessageRange messages,
                                                     std::span<const std::string_view> keysToCombine,
                                                     double maximumPausetime);

  // Does the same, and returns the remaining records in order.
  static TWReportingSessionMessages combineRapidMessages(const TWReportingSessionMessages& messages,
                                                         std::span<const std::string_view> keysToCombine,
                                                         double maximumPausetime);

  // True when a video call reported that a position was invalid: a key begins with "vdac_invalid_".
  static bool isVidroXYerrorMessage(const TWReportingSessionMessage& message);
};

}  // namespace tonewerk

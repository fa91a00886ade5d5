// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <span>
#include <string_view>

#include "session/TWReportingSessionMessage.h"

namespace tonewerk {

// What several workers need.
class TWReportingSessionWorkerUtility {
 public:
  // Merges bursts of messages that each carry one of `keysToCombine` into the burst's first message, whose
  // payload is changed in place, and gives the surviving records in order. A burst ends with a key's second
  // coming; a message that comes `maximumPausetime` seconds or more after the last merged one stands alone
  // and does not end it.
  static TWReportingSessionMessages combineRapidMessages(const TWReportingSessionMessages& messages,
                                                         std::span<const std::string_view> keysToCombine,
                                                         double maximumPausetime);

  // Whether a video call reported that a position was invalid: any key begins with "vdac_invalid_".
  static bool isVidroXYerrorMessage(const TWReportingSessionMessage& message);
};

}  // namespace tonewerk

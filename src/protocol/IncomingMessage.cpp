// SPDX-License-Identifier: Apache-2.0
#include "protocol/IncomingMessage.h"

#include <utility>

namespace tonewerk {

Arguments IncomingMessage::arguments() const {
  Argument identifiers;
  if (reporterIDs) identifiers = ValueArray(std::vector<Value>(reporterIDs->begin(), reporterIDs->end()));
  return {payload, category, type, std::move(identifiers)};
}

}  // namespace tonewerk

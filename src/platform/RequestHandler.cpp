// SPDX-License-Identifier: Apache-2.0
#include "platform/RequestHandler.h"

namespace tonewerk {

Arguments IncomingMessage::arguments() const {
  Argument identifiers;
  if (reporterIDs) identifiers = ValueArray(std::vector<Value>(reporterIDs->begin(), reporterIDs->end()));
  return {payload, category, type, std::move(identifiers)};
}

}  // namespace tonewerk

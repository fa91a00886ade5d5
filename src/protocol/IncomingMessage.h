// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <vector>

#include "protocol/AudioEvent.h"
#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// A client's message: the parameters of the request that carries one.
struct IncomingMessage {
  ValueMap payload;
  AudioEventCategory category = 0;
  AudioEventType type = 0;
  std::optional<std::vector<ReporterID>> reporterIDs;  // none for nil

  Arguments arguments() const;
};

}  // namespace tonewerk

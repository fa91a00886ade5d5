// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "values/Value.h"

namespace tonewerk {

// Requests stall traces: a record of the whole system at the moment when something stalled. Any thread.
class WhirlcapRequest {
 public:
  struct Flags {
    bool first = false;
    bool second = false;
  };

  virtual ~WhirlcapRequest() = default;

  // Returns at once. The service logs what it cannot do.
  virtual void request(std::string requester, std::string reason, std::string description, ValueMap payload,
                       Flags flags) = 0;
};

}  // namespace tonewerk

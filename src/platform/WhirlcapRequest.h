// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "values/Value.h"

namespace tonewerk {

// Requests a stall trace: a look at the whole system at the moment when something came to a halt. Any thread.
class WhirlcapRequest {
 public:
  struct Flags {
    bool first = false;
    bool second = false;
  };

  virtual ~WhirlcapRequest() = default;

  // Returns at once; what cannot be done is in the service's own log lines.
  virtual void request(std::string requester, std::string reason, std::string description, ValueMap payload,
                       Flags flags) = 0;
};

}  // namespace tonewerk

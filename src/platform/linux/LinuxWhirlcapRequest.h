// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/WhirlcapRequest.h"

namespace tonewerk {

class LogCategory;

// Nothing collects stall traces yet: every request is an error line in the log.
class LinuxWhirlcapRequest final : public WhirlcapRequest {
 public:
  // `log` outlives the service.
  explicit LinuxWhirlcapRequest(const LogCategory& log) : log_(log) {}

  void request(std::string requester, std::string reason, std::string description, ValueMap payload,
               Flags flags) override;

 private:
  const LogCategory& log_;
};

}  // namespace tonewerk

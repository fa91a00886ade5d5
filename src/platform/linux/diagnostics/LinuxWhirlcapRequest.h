// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/WhirlcapRequest.h"

namespace tonewerk {

class DiagnosticsStore;
class LogCategory;

// Leaves each request with what was collected at once in the diagnostics store, as a folder of "whirlcaps".
// What the store refuses is an error line in the log.
class LinuxWhirlcapRequest final : public WhirlcapRequest {
 public:
  // Both outlive the service.
  LinuxWhirlcapRequest(DiagnosticsStore& store, const LogCategory& log) : store_(store), log_(log) {}

  void request(std::string requester, std::string reason, std::string description, ValueMap payload,
               Flags flags) override;

 private:
  DiagnosticsStore& store_;
  const LogCategory& log_;
};

}  // namespace tonewerk

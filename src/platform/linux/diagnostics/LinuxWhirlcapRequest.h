// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/WhirlcapRequest.h"

namespace tonewerk {

class DiagnosticsStore;
class LogCategory;

// Adds each request to the diagnostics store, as a folder of "whirlcaps". A request that the store refuses is
// logged as an error.
class LinuxWhirlcapRequest final : public WhirlcapRequest {
 public:
  // Both must outlive the service.
  LinuxWhirlcapRequest(DiagnosticsStore& store, const LogCategory& log) : store_(store), log_(log) {}

  void request(std::string requester, std::string reason, std::string description, ValueMap payload,
               Flags flags) override;

 private:
  DiagnosticsStore& store_;
  const LogCategory& log_;
};

}  // namespace tonewerk

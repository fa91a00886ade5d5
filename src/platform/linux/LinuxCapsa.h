// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/FaultsignReporter.h"

namespace tonewerk {

// Nothing captures diagnostics yet: parameters are accepted, and answered with kFaultsignErrorNotSupported
// before the call returns.
class LinuxCapsa final : public Capsa {
 public:
  std::unique_ptr<FaultsignReporter> makeReporter() override;

 private:
  class Reporter;
};

}  // namespace tonewerk

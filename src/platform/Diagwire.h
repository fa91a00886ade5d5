// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

namespace PB {
class Base;
}

// Records metrics for wireless diagnostics. Any thread.
class Diagwire {
 public:
  virtual ~Diagwire() = default;

  // Encodes the record in its protocol-buffer form before it returns. May wait while the recorder's queue is
  // full.
  virtual void post(std::uint32_t metricIdentifier, const PB::Base& record) = 0;
};

}  // namespace tonewerk

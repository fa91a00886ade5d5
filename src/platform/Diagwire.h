// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

namespace PB {
class Base;
}

// The wireless-diagnostics metric service. Any thread.
class Diagwire {
 public:
  virtual ~Diagwire() = default;

  // Takes the record's protocol-buffer form before it returns. May wait while the recorder's queue is full.
  virtual void post(std::uint32_t metricIdentifier, const PB::Base& record) = 0;
};

}  // namespace tonewerk

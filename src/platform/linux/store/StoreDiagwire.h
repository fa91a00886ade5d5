// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Diagwire.h"

namespace tonewerk {

class Clock;
class ReportStore;

// The metric service over the report store. Records become rows of its metric table.
class StoreDiagwire final : public Diagwire {
 public:
  // `store` and `clock` outlive it.
  StoreDiagwire(ReportStore& store, const Clock& clock) : store_(store), clock_(clock) {}

  void post(std::uint32_t metricIdentifier, const PB::Base& record) override;

 private:
  ReportStore& store_;
  const Clock& clock_;
};

}  // namespace tonewerk

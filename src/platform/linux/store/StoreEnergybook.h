// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Energybook.h"

namespace tonewerk {

class Clock;
class ReportStore;

// The power log over the report store. Events become rows of its table of power events.
class StoreEnergybook final : public Energybook {
 public:
  // `store` and `clock` outlive it.
  StoreEnergybook(ReportStore& store, const Clock& clock) : store_(store), clock_(clock) {}

  void sendEvent(std::int32_t group, const SharedString& name, ValueMap payload) override;

 private:
  ReportStore& store_;
  const Clock& clock_;
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreEnergybook.h"

#include <utility>

#include "platform/Clock.h"
#include "platform/linux/store/ReportStore.h"

namespace tonewerk {

void StoreEnergybook::sendEvent(std::int32_t group, const SharedString& name, ValueMap payload) {
  store_.record(PowerRow{clock_.now(), group, name, std::move(payload)});
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreSessionBook.h"

#include "platform/linux/store/ReportStore.h"

namespace tonewerk {

void StoreSessionBook::enter(const std::shared_ptr<SessionLife>& life, const SharedString& application,
                             const SharedString& process, const std::optional<SessionEnd>& end) {
  store_.record(LifeRow{life, application, process, end});
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionWorkerRegistry.h"

#include <utility>

#include "platform/Log.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

TWReportingSessionWorkerRegistry::TWReportingSessionWorkerRegistry(Classes all) : all_(std::move(all)) {
  for (const TWReportingSessionWorkerClass* workerClass : all_) {
    if (workerClass->initWithSession == nullptr) {
      debugLog(TWReportingSessionCategory(), "Worker does not implement initWithSession! %@",
               workerClass->name);
      continue;
    }
    valid_.push_back(workerClass);
    if (workerClass->isConsumer) {
      consumers_.push_back(workerClass);
      slowTypes_ = slowTypes_ | workerClass->slowTypes;
    }
    if (workerClass->isProducer) producers_.push_back(workerClass);
    if (workerClass->startOnInit) startOnInit_.push_back(workerClass);
  }
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "support/ReportingTest.h"
#include "workers/diagnostics/SharedWorkerInstanceStates.h"
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"
#include "workers/diagnostics/WorkerInstanceState.h"

namespace tonewerk {

// Base of the capture worker's tests: an internal build on which the haptics instance is enabled.
class CapsaTest : public ReportingTest {
 protected:
  CapsaTest() : ReportingTest({&TWReportingSessionCapsaWorker::kWorkerClass}) {
    makeInternalBuild();
    test.deviceFacts.set("HapticLeakCapture", true);
  }

  std::shared_ptr<TWReportingSession> makeSessionOf(AudioServiceType service) {
    auto session = TWReportingSession::initWithID(77, {4711, 12});
    session->setServiceType(service);
    session->setClientProcessName("player");
    return session;
  }

  static std::vector<std::string> namesOf(const TWReportingSessionCapsaWorker& worker) {
    std::vector<std::string> names;
    for (const auto& instance : worker.instances()) names.emplace_back(instance->instanceClass().name);
    return names;
  }

  // Returns null when the worker has no such instance.
  static WorkerInstanceState* stateOf(const TWReportingSessionCapsaWorker& worker, std::string_view name) {
    for (const auto& instance : worker.instances()) {
      if (instance->instanceClass().name == name) return &instance->workerState();
    }
    return nullptr;
  }

  static void handle(TWReportingSessionCapsaWorker& worker, const ValueMap& payload,
                     AudioEventCategory category, AudioEventType type) {
    worker.handleMessage(TWReportingSessionMessage(payload, category, type));
  }

  std::vector<std::string> infos() const { return test.log.textsOf("twrb", LogLevel::kInfo); }
  std::vector<std::string> errors() const { return test.log.textsOf("twrb", LogLevel::kError); }
};

}  // namespace tonewerk

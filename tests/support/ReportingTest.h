// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "session/MessageRange.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "support/TestPlatform.h"

namespace tonewerk {

// Makes the inside of a new daemon on doubles; the base of the tests of sessions, workers and the service.
class ReportingTest : public ::testing::Test {
 protected:
  using Classes = std::vector<const TWReportingSessionWorkerClass*>;

  explicit ReportingTest(Classes workerClasses = {}) { useWorkers(std::move(workerClasses)); }

  // Starts again with these worker classes. Call before the first session.
  void useWorkers(Classes workerClasses) {
    context.reset();
    context.emplace(test.platform(), std::move(workerClasses));
  }

  void makeInternalBuild() { test.deviceFacts.set("InternalBuild", true); }

  static std::shared_ptr<TWReportingSessionMessage> message(ValueMap payload, AudioEventCategory category = 4,
                                                            AudioEventType type = 0) {
    return std::make_shared<TWReportingSessionMessage>(std::move(payload), category, type);
  }

  // Returns a message with that time, which the daemon keeps.
  static std::shared_ptr<TWReportingSessionMessage> messageAt(double time, ValueMap payload,
                                                              AudioEventCategory category = 4,
                                                              AudioEventType type = 0) {
    payload.set("twreporting_timestamp", time);
    return message(std::move(payload), category, type);
  }

  std::shared_ptr<TWReportingSession> makeSession(ReporterID reporterID = 77) {
    return TWReportingSession::initWithID(reporterID, {4711});
  }

  TestPlatform test;
  std::optional<TWReportingContext> context;
};

// Returns the texts that `messages` hold under `key`, in order.
inline std::vector<std::string> textsUnder(std::string_view key, MessageRange messages) {
  std::vector<std::string> texts;
  for (const auto* message : messages) texts.push_back(textOf(message->message.find(key)));
  return texts;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "system/support/DaemonClient.h"

#include <gtest/gtest.h>

#include "system/support/ChildProcess.h"

namespace tonewerk {

DaemonClient::DaemonClient(const std::string& socketPath) {
  const std::error_code error = client_->connect({socketPath});
  EXPECT_FALSE(error) << "cannot connect to " << socketPath << ": " << error.message();
}

Answer DaemonClient::call(std::string_view method, const Arguments& arguments) {
  std::error_code error;
  const std::optional<Answer> answer = client_->call(method, arguments, kSystemTimeout, error);
  EXPECT_TRUE(answer) << method << " is not answered: " << error.message();
  return answer.value_or(Answer());
}

void DaemonClient::request(std::string_view method, const Arguments& arguments) {
  const std::string name(method);
  const std::error_code error =
      client_->request(method, arguments, [name, answered = answered_](const Answer& answer) {
        EXPECT_FALSE(answer.error) << name << ": " << answer.error->message;
        answered->push_back(name);
      });
  EXPECT_FALSE(error) << method << ": " << error.message();
}

void DaemonClient::notify(std::string_view method, const Arguments& arguments) {
  const std::error_code error = client_->notify(method, arguments);
  EXPECT_FALSE(error) << method << ": " << error.message();
}

void DaemonClient::create(ReporterID reporterID) {
  expectTrue("createReportingSession", {Value(reporterID)});
}

void DaemonClient::create(ReporterID reporterID, AudioServiceType serviceType) {
  create(reporterID);
  expectTrue("setServiceType", {Value(serviceType), Value(reporterID)});
}

void DaemonClient::setConfiguration(ReporterID reporterID, const ValueMap& configuration) {
  expectTrue("setConfiguration", {Value(configuration), Value(reporterID)});
}

void DaemonClient::send(const ValueMap& message, AudioEventCategory category, AudioEventType type,
                        const std::vector<ReporterID>& reporterIDs) {
  const Answer answer =
      call("sendMessage", ReportingClient::messageArguments(message, category, type, reporterIDs));
  EXPECT_FALSE(answer.error) << answer.error->message;
  EXPECT_FALSE(answer.result) << answer.result->text();
}

void DaemonClient::stop(ReporterID reporterID) {
  expectTrue("stopReportingSessionForID", {Value(reporterID)});
}

void DaemonClient::destroy(ReporterID reporterID) {
  expectTrue("destroyReportingSession", {Value(reporterID)});
}

AudioServiceType DaemonClient::serviceType(ReporterID reporterID) {
  const Answer answer = call("getServiceNameForReporterID", {Value(reporterID)});
  return static_cast<AudioServiceType>(answer.result.value_or(Value(-1)).integer());
}

std::vector<ReporterID> DaemonClient::allReporters() {
  const Answer answer = call("getAllReporters");
  std::vector<ReporterID> reporters;
  const ValueArray* list = answer.result ? answer.result->asArray() : nullptr;
  EXPECT_NE(list, nullptr);
  if (list == nullptr) return reporters;
  for (const Value& reporter : *list) reporters.push_back(reporter.integer());
  return reporters;
}

void DaemonClient::start(ReporterID reporterID) {
  request("startReportingSessionForID", {Value(reporterID)});
  // The daemon runs requests in order: once this one is answered, the session has been started.
  allReporters();
}

bool DaemonClient::waitForAnswers(std::size_t count) {
  return waitUntil([&] {
           if (answered_->size() < count) {
             EXPECT_FALSE(client_->processAnswers(std::chrono::milliseconds::zero()));
           }
           return answered_->size() >= count || !client_->isConnected();
         }) &&
         answered_->size() >= count;
}

bool DaemonClient::waitForEnd() {
  return waitUntil([&] {
    static_cast<void>(client_->processAnswers(std::chrono::milliseconds::zero()));
    return !client_->isConnected();
  });
}

void DaemonClient::expectTrue(std::string_view method, const Arguments& arguments) {
  const Answer answer = call(method, arguments);
  EXPECT_FALSE(answer.error) << method << ": " << answer.error->message;
  EXPECT_EQ(answer.result, Value(true)) << method;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "service/TWReportingClientServerInstance.h"
#include "service/TWReportingService.h"
#include "support/ReportingTest.h"
#include "support/memory/MemoryMessaging.h"

namespace tonewerk {

// Makes a service on doubles, with clients that connect in memory. Nothing runs on the work queue until
// run().
class ServiceTest : public ReportingTest {
 public:
  ~ServiceTest() override {
    messaging.shutDown();
    run();
  }

 protected:
  explicit ServiceTest(Classes workerClasses = {}) : ReportingTest(std::move(workerClasses)) {
    startService();
  }

  void startService() {
    service = TWReportingService::make([this] { ++processEnds; });
    messaging.setDelegate(*service);
    messaging.resume();
  }

  std::unique_ptr<MemoryClient> connect(std::int32_t processIdentifier,
                                        std::uint32_t user = MemoryMessaging::kOwner) {
    return messaging.connect(processIdentifier, user);
  }
  void run() { test.queues.runAll(); }
  // The account of the daemon's own user, who reaches all sessions.
  const std::shared_ptr<Account>& owner() { return test.accounts.own(); }

  // Sends a request and runs the work queue. Returns the request's answers in order.
  std::vector<MemoryResponse> ask(MemoryClient& client, std::string_view method, Arguments arguments) {
    const auto identifier = client.request(method, std::move(arguments));
    run();
    std::vector<MemoryResponse> answers = client.responses();
    std::erase_if(answers,
                  [identifier](const MemoryResponse& answer) { return answer.identifier != identifier; });
    return answers;
  }

  // Returns the result of a request that must have exactly one answer.
  Value askOnce(MemoryClient& client, std::string_view method, Arguments arguments) {
    const auto answers = ask(client, method, std::move(arguments));
    EXPECT_EQ(answers.size(), 1U);
    if (answers.empty() || !answers[0].result) return "(none)";
    return *answers[0].result;
  }

  void create(MemoryClient& client, ReporterID reporterID) {
    EXPECT_EQ(askOnce(client, "createReportingSession", {reporterID}), Value(true));
  }
  void start(MemoryClient& client, ReporterID reporterID) {
    create(client, reporterID);
    ask(client, "startReportingSessionForID", {reporterID});
  }

  // Returns the session of the client with that index; null when there is none.
  std::shared_ptr<TWReportingSession> sessionOf(std::size_t client, ReporterID reporterID) {
    const auto& sessions = service->getAllClients().at(client)->clientReportingSessionMap();
    const auto found = sessions.find(reporterID);
    return found == sessions.end() ? nullptr : found->second;
  }

  MemoryMessaging messaging{&test.accounts};
  int processEnds = 0;
  std::shared_ptr<TWReportingService> service;
};

}  // namespace tonewerk

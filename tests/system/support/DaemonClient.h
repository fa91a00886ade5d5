// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "protocol/AudioEvent.h"
#include "support/client/ReportingClient.h"
#include "values/Value.h"

namespace tonewerk {

// A correct client for tests. Every problem with its connection is a test failure.
class DaemonClient {
 public:
  explicit DaemonClient(const std::string& socketPath);

  // Waits for the answer. Without one, which is a test failure, the result has neither error nor result.
  Answer call(std::string_view method, const Arguments& arguments = {});
  // Its answer adds the method's name to answered(). An error answer is a test failure.
  void request(std::string_view method, const Arguments& arguments);
  void notify(std::string_view method, const Arguments& arguments);

  // These wait for their answers and expect success.
  void create(ReporterID reporterID);
  void create(ReporterID reporterID, AudioServiceType serviceType);
  void setConfiguration(ReporterID reporterID, const ValueMap& configuration);
  void send(const ValueMap& message, AudioEventCategory category, AudioEventType type,
            const std::vector<ReporterID>& reporterIDs);
  void stop(ReporterID reporterID);
  void destroy(ReporterID reporterID);
  AudioServiceType serviceType(ReporterID reporterID);
  std::vector<ReporterID> allReporters();

  // Returns when the daemon has started the session. The start itself is answered later.
  void start(ReporterID reporterID);

  // The methods sent by request() that the daemon has answered so far, in the order of the answers.
  const std::vector<std::string>& answered() const { return *answered_; }
  bool waitForAnswers(std::size_t count);

  // Whether the daemon has ended the connection.
  bool waitForEnd();
  void disconnect() { client_->disconnect(); }
  ReportingClient& reportingClient() { return *client_; }

 private:
  void expectTrue(std::string_view method, const Arguments& arguments);

  std::unique_ptr<ReportingClient> client_ = std::make_unique<ReportingClient>();
  std::shared_ptr<std::vector<std::string>> answered_ = std::make_shared<std::vector<std::string>>();
};

}  // namespace tonewerk

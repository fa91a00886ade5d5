// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/FaultsignReporter.h"
#include "platform/Log.h"

namespace tonewerk {

class TWReportingSession;
class TWReportingSessionCapsaWorkerInstance;
class TWReportingSessionMessage;
struct WorkerInstanceState;

// Describes a class of instances. Each class has one such object.
struct TWReportingSessionCapsaWorkerInstanceClass {
  std::string_view name;
  bool handleSingleMessageSession;
  // Returns null for a session to which the symptom does not apply.
  std::unique_ptr<TWReportingSessionCapsaWorkerInstance> (*initWithSession)(
      const std::shared_ptr<TWReportingSession>& session);

  std::string description() const { return std::string(name); }
};

// Recognises one symptom: it knows which messages show it and what to capture then. The capture worker that
// owns the instance counts the messages and decides when the instance fires. Lives on the work queue.
class TWReportingSessionCapsaWorkerInstance {
 public:
  virtual ~TWReportingSessionCapsaWorkerInstance() = default;

  virtual const TWReportingSessionCapsaWorkerInstanceClass& instanceClass() const = 0;
  virtual WorkerInstanceState& workerState() = 0;

  // True if the message shows the symptom.
  virtual bool interestedInMessage(const TWReportingSessionMessage& message) = 0;
  // Called for the messages that the instance is interested in and that are counted.
  virtual void handleMessage(const TWReportingSessionMessage& /*message*/) {}

  // False for an instance without fire(). Its messages are counted without end.
  virtual bool canFire() const { return false; }
  // Starts the capture. `message` is the one that reached the thresholds. The state has a reporter.
  virtual void fire(const TWReportingSessionMessage& /*message*/) {}

  virtual void start() {}
  virtual void stop() {}

 protected:
  // Gives instances' log lines their worker's name.
  static LogSite logSite(int line = __builtin_LINE());

  // Returns a handler that takes the answer to the work queue, stores its session identifier in the state if
  // the state still exists, and then calls `log`. `log` must not refer to the instance.
  using LogReply =
      std::function<void(const std::string& sessionIdentifier, const std::optional<ValueMap>& response)>;
  static FaultsignReporter::Reply replyHandler(const std::shared_ptr<WorkerInstanceState>& state,
                                               LogReply log);
};

}  // namespace tonewerk

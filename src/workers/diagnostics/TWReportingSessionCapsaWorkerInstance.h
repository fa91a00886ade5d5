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

// A class of instances. There is one object a class, and it stands for the class.
struct TWReportingSessionCapsaWorkerInstanceClass {
  std::string_view name;
  bool handleSingleMessageSession;
  // Null for a session to which the symptom does not apply.
  std::unique_ptr<TWReportingSessionCapsaWorkerInstance> (*initWithSession)(
      const std::shared_ptr<TWReportingSession>& session);

  std::string description() const { return std::string(name); }
};

// What knows one symptom: which messages show it, and what to capture then. The capture worker that owns it
// counts, and decides when it fires. On the work queue.
class TWReportingSessionCapsaWorkerInstance {
 public:
  virtual ~TWReportingSessionCapsaWorkerInstance() = default;

  virtual const TWReportingSessionCapsaWorkerInstanceClass& instanceClass() const = 0;
  virtual WorkerInstanceState& workerState() = 0;

  // Whether the message shows the symptom.
  virtual bool interestedInMessage(const TWReportingSessionMessage& message) = 0;
  // Gets the messages that it is interested in.
  virtual void handleMessage(const TWReportingSessionMessage& /*message*/) {}

  // For an instance without fire() the counting goes on without end.
  virtual bool canFire() const { return false; }
  // `message` is the one that made it enough. The state has a reporter.
  virtual void fire(const TWReportingSessionMessage& /*message*/) {}

  virtual void start() {}
  virtual void stop() {}

 protected:
  // Instances log under their worker's name.
  static LogSite logSite(int line = __builtin_LINE());

  // A handler that takes the answer to the work queue, keeps its identifier in the state if that is still
  // there, and then calls `log`, which must not refer to the instance.
  using LogReply =
      std::function<void(const std::string& sessionIdentifier, const std::optional<ValueMap>& response)>;
  static FaultsignReporter::Reply replyHandler(const std::shared_ptr<WorkerInstanceState>& state,
                                               LogReply log);
};

}  // namespace tonewerk

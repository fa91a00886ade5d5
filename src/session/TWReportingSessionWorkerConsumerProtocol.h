// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "session/TWReportingSessionWorkerProtocol.h"

namespace tonewerk {

class TWReportingSessionMessage;

// Gets the session's messages as they arrive.
//
// A class may have two static functions that return true: startOnInit(), to be made and started with the
// session, and handleSingleMessageSession(), to run in single-message sessions, too. One that does nothing
// with messages of other types may say so in a static constant `kHandledTypes`; it then does not get them.
// One that may wait in handleMessage() must say for which types in a constant `kSlowTypes`.
class TWReportingSessionWorkerConsumerProtocol : public virtual TWReportingSessionWorkerProtocol {
 public:
  // `message` is the session's own record: take a copy to keep or change it. The result is ignored.
  virtual bool handleMessage(const TWReportingSessionMessage& message) = 0;

  // True when the worker also wants redundant messages. Always the same for one worker.
  virtual bool handleRedundantMessages() const { return false; }

  TWReportingSessionWorkerConsumerProtocol* asConsumer() final { return this; }
};

}  // namespace tonewerk

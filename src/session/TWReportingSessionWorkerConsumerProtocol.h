// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "session/TWReportingSessionWorkerProtocol.h"

namespace tonewerk {

class TWReportingSessionMessage;

// A worker that gets the session's messages as they arrive.
//
// A class may answer two more questions with static functions returning true: startOnInit() to be made and
// started with the session, handleSingleMessageSession() to run in single-message sessions too.
class TWReportingSessionWorkerConsumerProtocol : public virtual TWReportingSessionWorkerProtocol {
 public:
  // The session's own record: take a copy to keep or change it. The result is ignored.
  virtual bool handleMessage(const TWReportingSessionMessage& message) = 0;

  // Whether it wants the messages, too, that repeat what is stored.
  virtual bool handleRedundantMessages() const { return false; }
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Would derive messages about how the device was held. It is switched off: no session gets one, and the
// registry does not list the class.
class TWReportingSessionOrientationMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // Always null. Keeps no reference to the session.
  static std::shared_ptr<TWReportingSessionOrientationMessagesWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Folds a session's messages, when it stops, into input summaries: one for each stretch of input on the same
// active devices, telling how long it ran, with which voice processing and through which vocoders.
//
//   running          |-----------------------------|
//   active devices   A ............ B ..............
//   vocoder          evs ... amr ...................
//   summaries        |-- A, amr:8k -||----- B -----|
//
// Only the active devices are compared. A vocoder's change closes nothing; it is listed in the summary of the
// stretch that it came in, with its sample rate. The vocoder that was in use before is not.
class TWReportingSessionInputMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionInputMessagesWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends the session its summaries.
  void stop() override;

  // The summaries of `messages`, in order, for the application `process` (null gives none). Stretches of
  // `minimumRunningtime` seconds or less are left out; what they listed goes to the next summary. Merges
  // messages that follow one another rapidly, in place.
  TWReportingSessionMessages createInputMessages(const TWReportingSessionMessages& messages,
                                                 const SharedString* process,
                                                 double minimumRunningtime) const;
};

}  // namespace tonewerk

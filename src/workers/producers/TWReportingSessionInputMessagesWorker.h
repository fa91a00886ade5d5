// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/MessageRange.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Folds a session's messages, when it stops, into input summaries. There is one for each interval of input on
// the same active devices. It says how long input ran, with which voice processing and through which
// vocoders.
//
//   running          |-----------------------------|
//   active devices   A ............ B ..............
//   vocoder          evs ... amr ...................
//   summaries        |-- A, amr:8k -||----- B -----|
//
// Only the active devices are compared. A change of the vocoder ends no interval. The new vocoder is listed,
// with its sample rate, in the summary of the interval in which it changed. The vocoder that was in use
// before is not listed.
class TWReportingSessionInputMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionInputMessagesWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends the summaries into the session.
  void stop() override;

  // The summaries of `messages`, in order, for the application `process`; null gives no summaries. Intervals
  // of `minimumRunningtime` seconds or less are left out, and their vocoders are listed in the next summary.
  // Merges messages that follow one another rapidly, in place.
  TWReportingSessionMessages createInputMessages(MessageRange messages, const SharedString* process,
                                                 double minimumRunningtime) const;
};

}  // namespace tonewerk

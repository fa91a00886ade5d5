// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/MessageRange.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Folds a session's messages, when it stops, into volume summaries. There is one for each interval of output
// in which the playback context stayed the same. It says how long was played at which volume, and with which
// format on which devices.
//
//   running          |-----------------------------|
//   volume           0.5 ........ 0.8 .............
//   summaries        |--- 0.5 ---||----- 0.8 ------|
//
// The selected format, the active devices, spatialisation, the ringer state and the volume are compared. The
// summary also holds the format identifier, the channels and the spatial accessory feature, which are not
// compared.
class TWReportingSessionVolumeMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionVolumeMessagesWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends the summaries into the session.
  void stop() override;

  // The summaries of `messages`, in order, for the application `process`; null gives no summaries. Intervals
  // of `minimumPlaytime` seconds or less are left out. Merges messages that follow one another rapidly, in
  // place.
  TWReportingSessionMessages createVolumeMessages(MessageRange messages, const SharedString* process,
                                                  double minimumPlaytime) const;
};

}  // namespace tonewerk

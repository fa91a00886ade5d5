// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Folds a session's messages, when it stops, into volume summaries: one for each stretch of output during
// which the playback context stayed the same, telling how long was played how loud, with which format on
// which devices.
//
//   running          |-----------------------------|
//   volume           0.5 ........ 0.8 .............
//   summaries        |--- 0.5 ---||----- 0.8 ------|
//
// Selected format, active devices, spatialisation, ringer state and volume are compared; format identifier,
// channels and the spatial accessory feature are carried along.
class TWReportingSessionVolumeMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionVolumeMessagesWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends the session its summaries.
  void stop() override;

  // The summaries of `messages`, in order, for the application `process` (null gives none). Stretches of
  // `minimumPlaytime` seconds or less are left out. Merges messages that follow one another rapidly, in
  // place.
  TWReportingSessionMessages createVolumeMessages(const TWReportingSessionMessages& messages,
                                                  const SharedString* process, double minimumPlaytime) const;
};

}  // namespace tonewerk

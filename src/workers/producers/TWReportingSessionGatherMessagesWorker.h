// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Folds a session's messages, when it stops, into gather summaries: one for each stretch of output within a
// Gather session (listening together), telling how long was played, with which format on which devices.
//
//   output running   |----------------------------|     |------|
//   gather_session   1 ...............................  0 ......
//   active devices   A ......... B ...............
//   summaries        |--- A ----||------- B ------|
//
// A stretch begins with a start of output that says "gather_session" 1. It closes with output, with the
// session, when the selected format or the active devices change, or when a start of output no longer says 1.
// A message that says 0 without a word on output does not close it.
//
// Summaries go to the analytics and the JSON file workers only.
class TWReportingSessionGatherMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionGatherMessagesWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends the session its summaries.
  void stop() override;

  // The summaries of `messages`, in order. Stretches of `minimumPlaytime` seconds or less are left out.
  // Changes no message.
  TWReportingSessionMessages createGatherMessages(const TWReportingSessionMessages& messages,
                                                  double minimumPlaytime) const;
};

}  // namespace tonewerk

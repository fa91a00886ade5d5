// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "session/MessageRange.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Folds a session's messages, when it stops, into gather summaries. There is one for each interval of output
// in a Gather session (listening together). It says how long was played, and with which format on which
// devices.
//
//   output running   |----------------------------|     |------|
//   gather_session   1 ...............................  0 ......
//   active devices   A ......... B ...............
//   summaries        |--- A ----||------- B ------|
//
// An interval begins with a start of output that says "gather_session" 1. It ends when output or the session
// ends, when the selected format or the active devices change, or with a start of output that does not say 1.
// A message that says 0 and nothing about output does not end it.
//
// Only the analytics and the JSON file workers get the summaries.
class TWReportingSessionGatherMessagesWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  explicit TWReportingSessionGatherMessagesWorker(const std::shared_ptr<TWReportingSession>& owner) {
    session = owner;
  }

  // Sends the summaries into the session.
  void stop() override;

  // The summaries of `messages`, in order. Intervals of `minimumPlaytime` seconds or less are left out. The
  // messages are not changed.
  TWReportingSessionMessages createGatherMessages(MessageRange messages, double minimumPlaytime) const;
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "client/AudioActivity.h"
#include "client/MessageRing.h"
#include "client/ReplyTable.h"
#include "client/SessionState.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
class ClientEngine;
struct Command;
}  // namespace tonewerk

// The object behind a caller's pointer to a session, with what the client knows of the session. After its
// caller has destroyed it, it is kept until the daemon was told so.
//
// Everything but `engine`, `identifier`, `losses` and `activity` is guarded by the engine's mutex.
struct twr_session : std::enable_shared_from_this<twr_session> {  // NOLINT(readability-identifier-naming)
  twr_session(tonewerk::ClientEngine& client, std::int64_t reporterID)
      : engine(client), identifier(reporterID) {}

  tonewerk::ClientEngine& engine;
  const std::int64_t identifier;

  // The state that the caller last asked for, and the state that was sent to the daemon.
  tonewerk::SessionState wanted;
  tonewerk::SessionState sent;
  bool isDestroyed = false;  // by its caller

  // The callers that wait for the present run to stop; null when there are none.
  std::shared_ptr<tonewerk::StartReplies> starts;

  tonewerk::LossCount losses;
  tonewerk::AudioActivity activity;
  tonewerk::ReportedLosses reported;
  std::size_t queued = 0;  // commands that wait in the queue
  std::size_t unsent = 0;  // frames that are being sent
  // The session's last command in the queue, if it is a reconciliation.
  tonewerk::Command* lastReconciliation = nullptr;

  std::vector<std::shared_ptr<twr_sender>> senders;  // also closed ones, until their rings are empty
};

// The object behind a real-time thread's pointer to a sender.
struct twr_sender {  // NOLINT(readability-identifier-naming)
  twr_sender(const std::shared_ptr<twr_session>& owner, const std::atomic<bool>& isForked, std::size_t bytes)
      : session(owner), hasForked(isForked), activity(owner->activity), ring(bytes, owner->losses) {}

  const std::weak_ptr<twr_session> session;
  const std::atomic<bool>& hasForked;
  tonewerk::AudioActivity& activity;  // the session's
  tonewerk::MessageRing ring;
  // The engine's mutex guards these two.
  bool isClosed = false;
  std::uint64_t lostAtClose = 0;  // the session's losses at that time
};

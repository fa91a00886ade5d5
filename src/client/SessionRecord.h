// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "client/MessageRing.h"
#include "client/ReplyTable.h"
#include "client/SessionState.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
class ClientEngine;
struct Command;
}  // namespace tonewerk

// What callers hold of a session, and what the client knows of it. It stays, without its caller, until the
// daemon has been told of its end.
//
// Everything but `engine`, `identifier` and `losses` is guarded by the engine's mutex.
struct twr_session : std::enable_shared_from_this<twr_session> {  // NOLINT(readability-identifier-naming)
  twr_session(tonewerk::ClientEngine& client, std::int64_t reporterID)
      : engine(client), identifier(reporterID) {}

  tonewerk::ClientEngine& engine;
  const std::int64_t identifier;

  // As the caller last asked for it, and as the daemon has been told.
  tonewerk::SessionState wanted;
  tonewerk::SessionState sent;
  bool isDestroyed = false;  // by its caller

  // Those who wait for the present run to stop; null when nobody does.
  std::shared_ptr<tonewerk::StartReplies> starts;

  tonewerk::LossCount losses;
  tonewerk::ToldLosses told;
  std::size_t queued = 0;  // commands that wait in the queue
  std::size_t unsent = 0;  // frames that are being sent
  // The last command in the queue, when it is one that leads to a state; nothing of the session follows it.
  tonewerk::Command* lastReconciliation = nullptr;

  std::vector<std::shared_ptr<twr_sender>> senders;  // closed ones, too, until their rings are empty
};

// What a real-time thread holds.
struct twr_sender {  // NOLINT(readability-identifier-naming)
  twr_sender(const std::shared_ptr<twr_session>& owner, const std::atomic<bool>& isForked, std::size_t bytes)
      : session(owner), hasForked(isForked), ring(bytes, owner->losses) {}

  const std::weak_ptr<twr_session> session;
  const std::atomic<bool>& hasForked;
  tonewerk::MessageRing ring;
  // Under the engine's mutex.
  bool isClosed = false;
  std::uint64_t lostAtClose = 0;  // of the session
};

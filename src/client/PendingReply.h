// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "tonewerk/reporting.h"

namespace tonewerk {

// What a request's result is, and so which members of the answer it fills.
enum class AnswerKind { kPlain, kServiceType, kValidity, kReporters };

// Whom to call with a request's answer; nobody when `function` is null.
struct PendingReply {
  twr_reply function = nullptr;
  void* context = nullptr;
  AnswerKind kind = AnswerKind::kPlain;
  bool isStart = false;    // waits for a session's stop
  bool mayBeHeld = false;  // by the daemon, for as long as it likes: the end does not wait for it

  explicit operator bool() const { return function != nullptr; }
};

// Those who wait for one run of a session to stop: the start's caller, and whoever started the session again
// while it was started, to whom the daemon says nothing.
struct StartReplies {
  std::vector<PendingReply> waiting;
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <unordered_map>
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

// Who waits for what on one connection, by the requests' identifiers.
class ReplyTable {
 public:
  struct Entry {
    PendingReply reply;
    // Of a start, whose answer is theirs; and of what ends a run, with whose answer at the latest they are
    // told.
    std::shared_ptr<StartReplies> starts;
    bool isStart = false;
  };

  // The identifier that the request is to be sent with.
  [[nodiscard]] std::uint32_t add(Entry entry);
  // None when nobody waits: an answer to nothing, or the second of two.
  [[nodiscard]] std::optional<Entry> take(std::uint32_t identifier);
  // In the order of the requests. A new connection begins anew.
  [[nodiscard]] std::vector<Entry> takeAll();

  // Somebody waits for an answer that the daemon gives as soon as it can.
  bool hasAwaited() const;
  std::size_t size() const { return entries_.size(); }

 private:
  std::unordered_map<std::uint32_t, Entry> entries_;
  std::uint32_t next_ = 1;
};

}  // namespace tonewerk

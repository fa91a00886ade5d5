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

// The kind of a request's result. It decides which members of the answer are filled.
enum class AnswerKind { kPlain, kServiceType, kValidity, kReporters };

// The function to call with a request's answer; none when `function` is null.
struct PendingReply {
  twr_reply function = nullptr;
  void* context = nullptr;
  AnswerKind kind = AnswerKind::kPlain;
  bool isStart = false;    // waits for a session's stop
  bool mayBeHeld = false;  // the daemon may hold the answer back; the end of the client does not wait for it

  explicit operator bool() const { return function != nullptr; }
};

// The callers that wait for one run of a session to stop: the caller of the start, and callers that started
// the session again while it was started, which the daemon does not answer.
struct StartReplies {
  std::vector<PendingReply> waiting;
};

// Holds the replies that wait for an answer on one connection, by the requests' identifiers.
class ReplyTable {
 public:
  struct Entry {
    PendingReply reply;
    // For a start: the callers that get its answer. For a request that ends a run: the callers that are
    // called with its answer at the latest.
    std::shared_ptr<StartReplies> starts;
    bool isStart = false;
  };

  // Returns the identifier with which the request must be sent.
  [[nodiscard]] std::uint32_t add(Entry entry);
  // None when no reply waits for this identifier, as for a second answer.
  [[nodiscard]] std::optional<Entry> take(std::uint32_t identifier);
  // Takes out all, in the order of the requests, and starts the identifiers again for a new connection.
  [[nodiscard]] std::vector<Entry> takeAll();

  // True while a reply waits for an answer that the daemon does not hold back.
  bool hasAwaited() const;
  std::size_t size() const { return entries_.size(); }

 private:
  std::unordered_map<std::uint32_t, Entry> entries_;
  std::uint32_t next_ = 1;
};

}  // namespace tonewerk

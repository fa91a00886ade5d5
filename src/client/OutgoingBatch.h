// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "client/CommandQueue.h"

namespace tonewerk {

// One frame that is on its way, and what is needed to take it back should it not get there.
struct OutgoingFrame {
  // kRecreation says again what the daemon had been told before; it needs no second time.
  enum class Origin { kQueue, kRing, kRecreation };

  Origin origin = Origin::kQueue;
  Command command;         // of a ring without its body, which is in the batch:
  std::size_t bodyAt = 0;  // there
  std::size_t bodyBytes = 0;
  std::uint32_t identifier = 0;  // of a request; 0 for a notification
  // Of what changes a session: how it was before.
  std::unique_ptr<SessionState> stateBefore;
  std::shared_ptr<StartReplies> startsBefore;
  std::size_t startCountBefore = 0;
  bool isMessage = false;
  // Of what a session is told or says: how its losses had been told before.
  std::uint64_t toldBefore = 0;
  std::uint64_t lateTold = 0;

  std::optional<std::uint32_t> optionalIdentifier() const {
    return identifier == 0 ? std::nullopt : std::optional(identifier);
  }
};

// Frames that are handed to the kernel in one piece, as far as it takes them. A frame has gone out when its
// last byte has.
class OutgoingBatch {
 public:
  // Enough frames for one write.
  static constexpr std::size_t kFullBytes = std::size_t{64} * 1024;

  bool isFull() const { return bytes_.size() >= kFullBytes; }
  bool empty() const { return frames_.empty(); }
  // What is left to be sent.
  std::string_view unsent() const { return std::string_view(bytes_).substr(sent_); }

  // A frame's bytes are appended here first, and then the frame added.
  std::string& bytes() { return bytes_; }
  void add(OutgoingFrame frame);

  // The kernel has taken so many bytes more. The frames that have thereby gone out, in order.
  [[nodiscard]] std::vector<OutgoingFrame> sent(std::size_t count);

  // The frames that have not gone out, in order; those of rings with their bodies. Nothing is left.
  [[nodiscard]] std::vector<OutgoingFrame> takeBack();

 private:
  struct Entry {
    OutgoingFrame frame;
    std::size_t end = 0;
  };

  void clear();

  std::string bytes_;
  std::size_t sent_ = 0;
  std::deque<Entry> frames_;
};

}  // namespace tonewerk

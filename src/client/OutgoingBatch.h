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

// A frame that is being sent, with what is needed to take it back when the connection breaks before it was
// sent.
struct OutgoingFrame {
  // kRecreation repeats what the daemon was told on an earlier connection; it is not put back into the queue.
  enum class Origin { kQueue, kRing, kRecreation };

  Origin origin = Origin::kQueue;
  Command command;  // for a ring without its body, which is in the batch's bytes from here:
  std::size_t bodyAt = 0;
  std::size_t bodyBytes = 0;
  std::uint32_t identifier = 0;  // of a request; 0 for a notification
  // For a change of a session: its state before.
  std::unique_ptr<SessionState> stateBefore;
  std::shared_ptr<StartReplies> startsBefore;
  std::size_t startCountBefore = 0;
  bool isMessage = false;
  // For all frames of a session: how many of its losses were reported before.
  std::uint64_t reportedBefore = 0;
  std::uint64_t lateReported = 0;

  std::optional<std::uint32_t> optionalIdentifier() const {
    return identifier == 0 ? std::nullopt : std::optional(identifier);
  }
};

// Collects frames that are given to the kernel together, as far as it takes them. A frame is sent when its
// last byte is.
class OutgoingBatch {
 public:
  // Enough frames for one write.
  static constexpr std::size_t kFullBytes = std::size_t{64} * 1024;

  bool isFull() const { return bytes_.size() >= kFullBytes; }
  bool empty() const { return frames_.empty(); }
  // The bytes that are still to be sent.
  std::string_view unsent() const { return std::string_view(bytes_).substr(sent_); }

  // A frame's bytes are appended here before add() is called.
  std::string& bytes() { return bytes_; }
  void add(OutgoingFrame frame);

  // The kernel has taken `count` more bytes. Returns the frames that are sent with them, in order.
  [[nodiscard]] std::vector<OutgoingFrame> sent(std::size_t count);

  // Takes out all frames that are not sent, in order. Those of rings get their bodies back.
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

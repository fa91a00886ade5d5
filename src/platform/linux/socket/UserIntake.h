// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <utility>
#include <vector>

#include "platform/accounts/Account.h"
#include "platform/linux/messaging/Slab.h"

namespace tonewerk {

// What the messaging thread has for one user: the slabs that the user's clients fill, and whose turn it is.
// The user has slabs of its own, so that requests which wait hold no memory of others.
//
// Frames that have not arrived as a whole may take as much as the user's share. When they take that much,
// only one of the connections that have such a frame is read, until its frame is complete; then the next one.
// Otherwise none of the frames would ever be complete.
class UserIntake {
 public:
  explicit UserIntake(std::shared_ptr<Account> user) : account(std::move(user)) {}

  const std::shared_ptr<Account> account;
  SlabPool slabs;
  std::size_t connections = 0;
  std::deque<std::uint64_t> ready;  // connections to be served

  // Whether a connection that has begun a frame may be read.
  [[nodiscard]] bool mayContinueFrame(std::uint64_t connection) {
    if (account->hasRoom(Resource::kReadBytes)) return true;
    if (frameHolder_ == kNobody) frameHolder_ = connection;
    if (frameHolder_ == connection) return true;
    if (std::find(waitingForFrames_.begin(), waitingForFrames_.end(), connection) ==
        waitingForFrames_.end()) {
      waitingForFrames_.push_back(connection);
    }
    return false;
  }
  // The connection has no frame that it has begun, any more. Returns the connections that may try again.
  [[nodiscard]] std::vector<std::uint64_t> endFrame(std::uint64_t connection) {
    if (frameHolder_ != connection) return {};
    frameHolder_ = kNobody;
    return std::exchange(waitingForFrames_, {});
  }

 private:
  static constexpr std::uint64_t kNobody = 0;

  std::uint64_t frameHolder_ = kNobody;
  std::vector<std::uint64_t> waitingForFrames_;
};

}  // namespace tonewerk

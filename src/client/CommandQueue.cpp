// SPDX-License-Identifier: Apache-2.0
#include "client/CommandQueue.h"

#include <algorithm>
#include <utility>

#include "client/SessionRecord.h"

namespace tonewerk {

bool CommandQueue::hasRoomForMessage(std::size_t bytes) const {
  return bytes_ == 0 || (bytes_ <= maxBytes_ && bytes <= maxBytes_ - bytes_);
}

bool CommandQueue::hasRoomForChange(std::size_t bytes) const {
  const std::size_t max = maxBytes_ + kReserveBytes;
  return bytes_ == 0 || (bytes_ <= max && bytes <= max - bytes_);
}

Command& CommandQueue::add(Command command) { return insert(commands_.end(), std::move(command)); }

Command& CommandQueue::insert(Iterator place, Command command) {
  Command& added = *commands_.insert(place, std::move(command));
  bytes_ += added.bytes;
  if (added.session != nullptr) ++added.session->queued;
  return added;
}

void CommandQueue::putBack(Command command) {
  commands_.push_front(std::move(command));
  if (commands_.front().session != nullptr) ++commands_.front().session->queued;
}

Command CommandQueue::take() {
  Command& first = commands_.front();
  if (first.session != nullptr) {
    --first.session->queued;
    if (first.session->lastReconciliation == &first) first.session->lastReconciliation = nullptr;
  }
  Command command = std::move(first);
  commands_.pop_front();
  return command;
}

void CommandQueue::remove(const Command& command) {
  removeAt(std::find_if(commands_.begin(), commands_.end(),
                        [&](const Command& other) { return &other == &command; }));
}

void CommandQueue::removeBarrier(const Waiter& waiter) {
  removeAt(std::find_if(commands_.begin(), commands_.end(),
                        [&](const Command& command) { return command.waiter.get() == &waiter; }));
}

void CommandQueue::removeAt(Iterator place) {
  if (place == commands_.end()) return;
  bytes_ -= place->bytes;
  if (place->session != nullptr) {
    --place->session->queued;
    if (place->session->lastReconciliation == &*place) place->session->lastReconciliation = nullptr;
  }
  commands_.erase(place);
}

std::list<Command> CommandQueue::takeAll() {
  for (const Command& command : commands_) {
    bytes_ -= command.bytes;
    if (command.session == nullptr) continue;
    --command.session->queued;
    command.session->lastReconciliation = nullptr;
  }
  return std::exchange(commands_, {});
}

}  // namespace tonewerk

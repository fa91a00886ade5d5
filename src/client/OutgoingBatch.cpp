// SPDX-License-Identifier: Apache-2.0
#include "client/OutgoingBatch.h"

#include <utility>

#include "client/SessionRecord.h"

namespace tonewerk {
namespace {

void countUnsent(const OutgoingFrame& frame, bool isMore) {
  if (frame.command.session == nullptr) return;
  std::size_t& unsent = frame.command.session->unsent;
  isMore ? ++unsent : --unsent;
}

}  // namespace

void OutgoingBatch::add(OutgoingFrame frame) {
  countUnsent(frame, true);
  frames_.push_back({std::move(frame), bytes_.size()});
}

std::vector<OutgoingFrame> OutgoingBatch::sent(std::size_t count) {
  sent_ += count;
  std::vector<OutgoingFrame> gone;
  while (!frames_.empty() && frames_.front().end <= sent_) {
    countUnsent(frames_.front().frame, false);
    gone.push_back(std::move(frames_.front().frame));
    frames_.pop_front();
  }
  if (frames_.empty()) clear();
  return gone;
}

std::vector<OutgoingFrame> OutgoingBatch::takeBack() {
  std::vector<OutgoingFrame> back;
  for (Entry& entry : frames_) {
    OutgoingFrame& frame = entry.frame;
    if (frame.origin == OutgoingFrame::Origin::kRing)
      frame.command.body = bytes_.substr(frame.bodyAt, frame.bodyBytes);
    countUnsent(frame, false);
    back.push_back(std::move(frame));
  }
  frames_.clear();
  clear();
  return back;
}

void OutgoingBatch::clear() {
  // The memory of a large frame is not kept. An assignment could keep it.
  if (bytes_.capacity() > 2 * kFullBytes) std::string().swap(bytes_);
  bytes_.clear();
  sent_ = 0;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/WorkBatch.h"

#include <cassert>
#include <utility>

namespace tonewerk {
namespace {

thread_local WorkBatch* currentBatch = nullptr;

}  // namespace

WorkBatch::WorkBatch() {
  assert(currentBatch == nullptr);
  currentBatch = this;
}

WorkBatch::~WorkBatch() {
  end();
  currentBatch = nullptr;
}

bool WorkBatch::putOff(std::shared_ptr<Ending> ending) {
  if (currentBatch == nullptr) return false;
  currentBatch->endings_.push_back(std::move(ending));
  return true;
}

void WorkBatch::pieceHasRun() {
  if (++pieces_ >= kMostPieces) end();
}

void WorkBatch::end() {
  pieces_ = 0;
  // By place: an ending may put off another.
  for (std::size_t at = 0; at < endings_.size(); ++at) {
    const std::shared_ptr<Ending> ending = std::move(endings_[at]);
    ending->endOfBatch();
  }
  endings_.clear();
}

}  // namespace tonewerk

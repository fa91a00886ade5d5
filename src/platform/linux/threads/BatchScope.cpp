// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/BatchScope.h"

#include <cassert>
#include <utility>

namespace tonewerk {
namespace {

thread_local BatchScope* currentBatch = nullptr;

}  // namespace

BatchScope::BatchScope() {
  assert(currentBatch == nullptr);
  currentBatch = this;
}

BatchScope::~BatchScope() {
  assert(currentBatch == this);
  end();
  currentBatch = nullptr;
}

bool BatchScope::defer(std::shared_ptr<Deferred> ending) {
  if (currentBatch == nullptr) return false;
  currentBatch->endings_.push_back(std::move(ending));
  return true;
}

void BatchScope::pieceHasRun() {
  assert(currentBatch == this);
  if (++pieces_ >= kMaxPieces) end();
}

void BatchScope::end() {
  pieces_ = 0;
  // By place: an ending may put off another.
  for (std::size_t at = 0; at < endings_.size(); ++at) {
    const std::shared_ptr<Deferred> ending = std::move(endings_[at]);
    ending->endOfBatch();
  }
  endings_.clear();
}

}  // namespace tonewerk

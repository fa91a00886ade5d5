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

bool BatchScope::defer(std::shared_ptr<Deferred> deferred) {
  if (currentBatch == nullptr) return false;
  currentBatch->deferred_.push_back(std::move(deferred));
  return true;
}

bool BatchScope::deferFirst(const std::shared_ptr<Deferred>& deferred) {
  if (currentBatch == nullptr) return false;
  if (currentBatch->first_ == nullptr) currentBatch->first_ = deferred;
  assert(currentBatch->first_ == deferred);
  return true;
}

void BatchScope::pieceHasRun() {
  if (currentBatch != nullptr && ++currentBatch->pieces_ >= kMaxPieces) currentBatch->end();
}

void BatchScope::end() {
  pieces_ = 0;
  if (const std::shared_ptr<Deferred> first = std::move(first_)) first->endOfBatch();
  // By index, because endOfBatch() may defer more.
  for (std::size_t at = 0; at < deferred_.size(); ++at) {
    const std::shared_ptr<Deferred> deferred = std::move(deferred_[at]);
    deferred->endOfBatch();
  }
  deferred_.clear();
}

}  // namespace tonewerk

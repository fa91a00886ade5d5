// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

namespace tonewerk {

// Groups the pieces of work that a thread runs one right after the other. What each of them would do for the
// same object, such as sending its replies, can be deferred to the end of the batch and is then done once.
//
// A batch belongs to the thread that makes it, until it is destroyed. A thread has one batch at a time.
class BatchScope {
 public:
  // Work that is deferred to the end of a batch. Called on the thread that deferred it.
  class Deferred {
   public:
    virtual ~Deferred() = default;
    virtual void endOfBatch() = 0;
  };

  // A batch ends after this many pieces, so that deferred work does not wait longer.
  static constexpr std::size_t kMaxPieces = 32;

  BatchScope();
  BatchScope(const BatchScope&) = delete;
  BatchScope& operator=(const BatchScope&) = delete;
  ~BatchScope();

  // Defers `deferred` to the end of the calling thread's batch. False when the thread has no batch.
  [[nodiscard]] static bool defer(std::shared_ptr<Deferred> deferred);

  // Defers `deferred`, of which there is one, before everything that is deferred otherwise. Again in the same
  // batch it changes nothing. False when the thread has no batch.
  [[nodiscard]] static bool deferFirst(const std::shared_ptr<Deferred>& deferred);

  // Call it after each piece of work. After kMaxPieces it ends the calling thread's batch and begins the next
  // one. Does nothing on a thread without a batch.
  static void pieceHasRun();

 private:
  void end();

  std::shared_ptr<Deferred> first_;
  std::vector<std::shared_ptr<Deferred>> deferred_;
  std::size_t pieces_ = 0;
};

}  // namespace tonewerk

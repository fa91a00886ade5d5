// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

namespace tonewerk {

// Pieces of work that a thread runs one right after the other. What each of them would do for the same
// object, such as sending its replies, can be put off to the end of the batch and is then done once.
//
// While one exists it is the calling thread's batch. One thread.
class BatchScope {
 public:
  // What is put off. Called on the thread that put it off.
  class Deferred {
   public:
    virtual ~Deferred() = default;
    virtual void endOfBatch() = 0;
  };

  // So long does nothing have to wait for others that follow it.
  static constexpr std::size_t kMaxPieces = 32;

  BatchScope();
  BatchScope(const BatchScope&) = delete;
  BatchScope& operator=(const BatchScope&) = delete;
  ~BatchScope();

  // Puts `ending` off to the end of the calling thread's batch. False when it runs none.
  [[nodiscard]] static bool defer(std::shared_ptr<Deferred> ending);

  // A piece of work has run. Ends the batch, and begins the next, after kMaxPieces.
  void pieceHasRun();

 private:
  void end();

  std::vector<std::shared_ptr<Deferred>> endings_;
  std::size_t pieces_ = 0;
};

}  // namespace tonewerk

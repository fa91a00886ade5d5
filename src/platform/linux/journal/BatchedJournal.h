// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/Journal.h"
#include "platform/linux/threads/BatchScope.h"
#include "values/Mutex.h"

namespace tonewerk {

// Writes another journal at the end of each batch of work. Who sends answers, or stores what came of
// requests, calls write() before: so what was answered is with the kernel. A record that is appended outside
// of a batch is written at once, and so is a request that came without a frame.
//
// The work queue's work may run on two threads in turn, and the batch of the one may end while the other
// appends. So this journal may be used on any thread.
class BatchedJournal final : public Journal {
 public:
  // `journal` outlives the object, which outlives all batches in which it is used.
  explicit BatchedJournal(Journal& journal) : journal_(journal) {}
  BatchedJournal(const BatchedJournal&) = delete;
  BatchedJournal& operator=(const BatchedJournal&) = delete;

  std::uint64_t append(Kind kind, const Origin& origin, std::string_view bytes) override;
  std::uint64_t append(const Origin& origin, std::string_view method, const Arguments& arguments) override;
  [[nodiscard]] bool write() override;
  [[nodiscard]] bool sync() override { return journal_.sync(); }
  Reading read(FunctionRef<bool(const Record&)> visit) override { return journal_.read(visit); }
  void drop(std::uint64_t before) override;
  void clear() override;
  std::uint64_t firstWithin(std::uint64_t bytes) const override;
  std::uint64_t last() const override;
  void continueAfter(std::uint64_t sequence) override;
  std::uint64_t bytes() const override { return journal_.bytes(); }

 private:
  class AtEndOfBatch final : public BatchScope::Deferred {
   public:
    explicit AtEndOfBatch(BatchedJournal& journal) : journal_(journal) {}
    // The journal logs a failure, and tries again with the next record.
    void endOfBatch() override { (void)journal_.write(); }

   private:
    BatchedJournal& journal_;
  };

  Journal& journal_;
  mutable Mutex mutex_;
  const std::shared_ptr<AtEndOfBatch> atEnd_ = std::make_shared<AtEndOfBatch>(*this);
};

}  // namespace tonewerk

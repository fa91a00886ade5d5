// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <compare>
#include <cstdint>

namespace tonewerk {

// The place in the journal of the request for which a thread works, and the number of the rows that the
// request has recorded so far. When the journal is played after a crash, the store leaves out the rows that
// it has already: those up to the last place that its file names.
//
// Used by one thread at a time.
class JournalPosition {
 public:
  // A row of a request, from 1. Both are 0 for a row of no request.
  struct Row {
    std::uint64_t sequence = 0;
    std::uint32_t number = 0;

    friend auto operator<=>(const Row&, const Row&) = default;  // NOLINT(modernize-use-nullptr): is none
  };

  // 0: no request of the journal. `at`: when the request came, in seconds since 1970.
  explicit JournalPosition(std::uint64_t sequence = 0, double at = 0.0) : sequence_(sequence), at_(at) {}

  std::uint64_t sequence() const { return sequence_; }
  double at() const { return at_; }

  // The calling thread works for this request as long as the scope lives. Scopes nest; the innermost counts.
  class Scope {
   public:
    // `position` outlives the scope.
    explicit Scope(JournalPosition& position);
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;
    ~Scope();

   private:
    JournalPosition* const outer_;
  };

  // The calling thread's request. What goes on with it later takes a copy, which counts on.
  static JournalPosition current();
  // Counts a row of the calling thread's request.
  static Row nextRow();

 private:
  std::uint64_t sequence_;
  double at_;
  std::uint32_t rows_ = 0;
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <deque>
#include <optional>
#include <string>
#include <vector>

#include "platform/IssueDraftService.h"
#include "values/Mutex.h"

namespace tonewerk {

// Records the drafts that were requested, and answers for one when the test asks for it. Any thread.
//
//   EXPECT_THAT(test.issueDrafts.requests(), SizeIs(1));
//   test.issueDrafts.answerNext();                          // made
//   test.issueDrafts.answerNext("the disk is full");        // not made; without a call, no answer ever
class MemoryIssueDraftService final : public IssueDraftService {
 public:
  struct Request {
    TrackletDraft draft;
    std::optional<std::string> processName;
    std::string displayReason;
  };

  void createDraft(TrackletDraft draft, std::optional<std::string> processName, std::string displayReason,
                   CompletionHandler completionHandler) override;

  std::vector<Request> requests() const;
  // Returns the number of requests without an answer.
  std::size_t unanswered() const;
  // Runs the handler of the oldest unanswered request here. Returns false when there is none.
  [[nodiscard]] bool answerNext(const std::optional<std::string>& error = std::nullopt);

 private:
  mutable Mutex mutex_;
  std::vector<Request> requests_ GUARDED_BY(mutex_);
  std::deque<CompletionHandler> waiting_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk

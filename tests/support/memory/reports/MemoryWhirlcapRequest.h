// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "platform/WhirlcapRequest.h"
#include "values/Mutex.h"

namespace tonewerk {

// Records the stall traces that were requested. Any thread.
//
//   EXPECT_THAT(test.whirlcaps.requests(), SizeIs(1));
//   test.whirlcaps.onRequest([&] { ... });     // runs at each request, to look at the state of the test
class MemoryWhirlcapRequest final : public WhirlcapRequest {
 public:
  struct Request {
    std::string requester;
    std::string reason;
    std::string description;
    ValueMap payload;
    Flags flags;
  };

  void request(std::string requester, std::string reason, std::string description, ValueMap payload,
               Flags flags) override;

  std::vector<Request> requests() const;
  void onRequest(std::function<void()> observer);

 private:
  mutable Mutex mutex_;
  std::vector<Request> requests_ GUARDED_BY(mutex_);
  std::function<void()> observer_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk

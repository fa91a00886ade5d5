// SPDX-License-Identifier: Apache-2.0
#include "platform/RequestHandler.h"

#include <gtest/gtest.h>
#include <memory>
#include <utility>

namespace tonewerk {
namespace {

class RecordingCounter final : public InFlightCounter {
 public:
  void finished(std::size_t size) override {
    ++requests;
    bytes += size;
  }
  int requests = 0;
  std::size_t bytes = 0;
};

TEST(InFlightTokenTest, FinishesItsRequestOnceHoweverOftenItIsMoved) {
  const auto counter = std::make_shared<RecordingCounter>();
  {
    InFlightToken token(counter, 10);
    InFlightToken carried = std::move(token);
    InFlightToken other(counter, 5);
    other = std::move(carried);
    EXPECT_EQ(counter->requests, 1);  // the token that was replaced by the assignment
    EXPECT_EQ(counter->bytes, 5U);
  }
  EXPECT_EQ(counter->requests, 2);
  EXPECT_EQ(counter->bytes, 15U);
}

}  // namespace
}  // namespace tonewerk

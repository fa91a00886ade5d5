// SPDX-License-Identifier: Apache-2.0
#include "values/FunctionRef.h"

#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <utility>

namespace tonewerk {
namespace {

std::string callWith(FunctionRef<std::string(int, std::unique_ptr<int>)> function, int number) {
  return function(number, std::make_unique<int>(number + 1));
}

TEST(FunctionRefTest, CallsWhatItRefersTo) {
  std::string calls;
  const auto note = [&calls](int number, std::unique_ptr<int> next) {
    calls += std::to_string(number) + std::to_string(*next);
    return calls;
  };
  EXPECT_EQ(callWith(note, 1), "12");
  EXPECT_EQ(callWith(note, 3), "1234");
}

TEST(FunctionRefTest, ACopyRefersToTheSame) {
  int calls = 0;
  const auto count = [&calls] { ++calls; };
  const FunctionRef<void()> first(count);
  const FunctionRef<void()> second = first;
  first();
  second();
  EXPECT_EQ(calls, 2);
}

}  // namespace
}  // namespace tonewerk

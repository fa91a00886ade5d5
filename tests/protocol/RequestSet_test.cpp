// SPDX-License-Identifier: Apache-2.0
#include "protocol/RequestSet.h"

#include <gtest/gtest.h>
#include <limits>

namespace tonewerk {
namespace {

constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();

std::optional<std::string> problemOf(ParameterType type, const Argument& argument) {
  return problemWith(Method{"test", {{"it", type}}}, {argument});
}

void expectSuits(ParameterType type, const Argument& argument) {
  EXPECT_EQ(problemOf(type, argument), std::nullopt) << (argument ? argument->text() : "nil");
}

void expectRefused(ParameterType type, const Argument& argument) {
  EXPECT_NE(problemOf(type, argument), std::nullopt) << (argument ? argument->text() : "nil");
}

TEST(RequestSetTest, ASignedIntegerHasSixtyFourBits) {
  constexpr ParameterType kType = ParameterType::kInt64;
  for (const Value& value :
       {Value(kLeast), Value(-1), Value(0), Value(kMax), Value(static_cast<std::uint64_t>(kMax))}) {
    expectSuits(kType, value);
  }
  expectRefused(kType, Value(static_cast<std::uint64_t>(kMax) + 1));
}

TEST(RequestSetTest, AThirtyTwoBitIntegerIsFromZeroTo4294967295) {
  constexpr ParameterType kType = ParameterType::kUInt32;
  for (const Value& value : {Value(0), Value(0U), Value(4294967295), Value(std::uint64_t{4294967295})}) {
    expectSuits(kType, value);
  }
  for (const Value& value : {Value(-1), Value(4294967296), Value(std::uint64_t{4294967296}), Value(kLeast)}) {
    expectRefused(kType, value);
  }
}

TEST(RequestSetTest, ASixteenBitIntegerIsFromZeroTo65535) {
  constexpr ParameterType kType = ParameterType::kUInt16;
  for (const Value& value : {Value(0), Value(65535), Value(std::uint64_t{65535})}) expectSuits(kType, value);
  for (const Value& value : {Value(-1), Value(65536), Value(std::uint64_t{65536})})
    expectRefused(kType, value);
}

TEST(RequestSetTest, NothingElseIsAnInteger) {
  for (const ParameterType type : {ParameterType::kInt64, ParameterType::kUInt32, ParameterType::kUInt16}) {
    expectRefused(type, Value(1.0));
    expectRefused(type, Value(true));
    expectRefused(type, Value("1"));
    expectRefused(type, Value(Date{1}));
    expectRefused(type, Value(ValueArray{1}));
    expectRefused(type, std::nullopt);
  }
}

TEST(RequestSetTest, AMapParameterTakesOnlyAMap) {
  expectSuits(ParameterType::kMap, Value(ValueMap()));
  expectRefused(ParameterType::kMap, Value(ValueArray()));
  expectRefused(ParameterType::kMap, Value("{}"));
  expectRefused(ParameterType::kMap, std::nullopt);
}

TEST(RequestSetTest, AListOfIntegersMayBeNilOrEmpty) {
  constexpr ParameterType kType = ParameterType::kInt64ListOrNone;
  expectSuits(kType, std::nullopt);
  expectSuits(kType, Value(ValueArray()));
  expectSuits(kType, Value(ValueArray{kLeast, 0U, kMax}));
  expectRefused(kType, Value(ValueArray{1, 2.0}));
  expectRefused(kType, Value(ValueArray{static_cast<std::uint64_t>(kMax) + 1}));
  expectRefused(kType, Value(ValueArray(std::vector<Value>{Value(ValueArray())})));
  expectRefused(kType, Value(1));
  expectRefused(kType, Value(ValueMap()));
}

TEST(RequestSetTest, TheNumberOfArgumentsMustBeRight) {
  const Method method{"two", {{"a", ParameterType::kInt64}, {"b", ParameterType::kInt64ListOrNone}}};
  EXPECT_EQ(problemWith(method, {Value(1), std::nullopt}), std::nullopt);
  EXPECT_EQ(problemWith(method, {Value(1)}), "two takes 2 arguments, not 1");
  EXPECT_EQ(problemWith(method, {Value(1), std::nullopt, Value(2)}), "two takes 2 arguments, not 3");
}

TEST(RequestSetTest, AProblemNamesTheMethodAndTheArgument) {
  const Method method{"send", {{"id", ParameterType::kInt64}, {"category", ParameterType::kUInt32}}};
  EXPECT_EQ(problemWith(method, {Value(1), Value(-1)}),
            "send: argument 2 (category) must be an integer from 0 to 4294967295");
}

TEST(RequestSetTest, FindsAMethodByItsWholeName) {
  const RequestSet interface {
    {
      {"start", {}}, {
        "stop", {}
      }
    }
  };
  EXPECT_EQ(interface.find("stop"), 1U);
  EXPECT_EQ(interface.find("sto"), std::nullopt);
  EXPECT_EQ(interface.find(""), std::nullopt);
}

TEST(RequestSetTest, SomeMethodsAreForTrustedUsers) {
  const Method method{"watch", {}, {}, 0, true};
  EXPECT_EQ(problemWithCaller(method, true), std::nullopt);
  const ReplyError refusal{std::string(kMessagingErrorDomain), kNotPermitted,
                           "not permitted: watch is for trusted users"};
  EXPECT_EQ(problemWithCaller(method, false), refusal);
}

TEST(RequestSetTest, OtherMethodsAreForEveryUser) {
  EXPECT_EQ(problemWithCaller(Method{"test", {}}, false), std::nullopt);
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameDecoder.h"

#include <cstdint>
#include <gmock/gmock.h>
#include <limits>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/messagepack/RandomMaps.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"
#include "values/ShapeTable.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::Optional;

class RpcFrameDecoderTest : public ::testing::Test {
 protected:
  // Null when the frame is not one that decodeMessage() takes.
  IncomingMessage* decodeMessage(const std::string& frame) {
    RpcFrameScanner scanner;
    EXPECT_EQ(scanner.scan(frame), RpcFrameScanner::Result::kFrame);
    return decoder.decodeMessage({frame, scanner.frame().argumentCount, scanner.frame().arguments}, shapes);
  }
  static std::string frameOf(const Arguments& arguments) {
    std::string frame;
    RpcWriter(frame).request(7, requests::kSendMessage.name, arguments);
    return frame;
  }
  static std::optional<ReporterID> sessionOf(const Arguments& arguments) {
    const std::string frame = frameOf(arguments);
    RpcFrameScanner scanner;
    EXPECT_EQ(scanner.scan(frame), RpcFrameScanner::Result::kFrame);
    return RpcFrameDecoder::sessionOf({frame, scanner.frame().argumentCount, scanner.frame().arguments});
  }
  bool takes(const Arguments& arguments) { return decodeMessage(frameOf(arguments)) != nullptr; }

  RpcFrameDecoder decoder;
  ShapeTable shapes;
};

const ValueMap kPayload{{"level", 0.5}, {"device", "Speaker"}};
const Value kIdentifiers(ValueArray({Value(1), Value(-2)}));

TEST_F(RpcFrameDecoderTest, DecodesAMessageWithAPackedPayload) {
  const IncomingMessage* message = decodeMessage(frameOf({kPayload, 4, 1, kIdentifiers}));
  ASSERT_NE(message, nullptr);
  EXPECT_NE(message->payload.packed(), nullptr);
  EXPECT_EQ(message->payload, kPayload);
  EXPECT_EQ(message->category, 4U);
  EXPECT_EQ(message->type, 1);
  EXPECT_THAT(message->reporterIDs, Optional(ElementsAre(1, -2)));
}

TEST_F(RpcFrameDecoderTest, AMessageMayNameNoSessions) {
  const IncomingMessage* message = decodeMessage(frameOf({kPayload, 4, 1, std::nullopt}));
  ASSERT_NE(message, nullptr);
  EXPECT_EQ(message->reporterIDs, std::nullopt);
  message = decodeMessage(frameOf({kPayload, 4, 1, Value(ValueArray())}));
  ASSERT_NE(message, nullptr);
  EXPECT_THAT(message->reporterIDs, Optional(ElementsAre()));
}

TEST_F(RpcFrameDecoderTest, TellsTheSessionOfAMessageForOneSessionAlone) {
  EXPECT_EQ(sessionOf({kPayload, 4, 1, Value(ValueArray({7}))}), 7);
  EXPECT_EQ(sessionOf({kPayload, 4, 1, Value(ValueArray({std::numeric_limits<std::int64_t>::min()}))}),
            std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(sessionOf({kPayload, 4, 1, kIdentifiers}), std::nullopt);
  EXPECT_EQ(sessionOf({kPayload, 4, 1, Value(ValueArray())}), std::nullopt);
  EXPECT_EQ(sessionOf({kPayload, 4, 1, std::nullopt}), std::nullopt);
  EXPECT_EQ(sessionOf({kPayload, 4, 1, Value(ValueArray({"7"}))}), std::nullopt);
  EXPECT_EQ(sessionOf({kPayload, 4, Value(ValueArray({7}))}), std::nullopt);
  EXPECT_EQ(sessionOf({}), std::nullopt);
}

TEST_F(RpcFrameDecoderTest, AMessageHasNothingOfTheOneBefore) {
  ASSERT_TRUE(takes({kPayload, 4, 1, kIdentifiers}));
  const IncomingMessage* message = decodeMessage(frameOf({ValueMap{{"a", 1}}, 5, 2, Value(ValueArray({9}))}));
  ASSERT_NE(message, nullptr);
  EXPECT_EQ(message->payload, (ValueMap{{"a", 1}}));
  EXPECT_THAT(message->reporterIDs, Optional(ElementsAre(9)));
}

TEST_F(RpcFrameDecoderTest, KeepsNothingOfAMessageThatNobodyTook) {
  std::vector<Value> many(100'000, Value(1));
  IncomingMessage* message = decodeMessage(frameOf({kPayload, 4, 1, Value(ValueArray(std::move(many)))}));
  ASSERT_NE(message, nullptr);
  decoder.releaseMessage();
  EXPECT_TRUE(message->payload.empty());
  EXPECT_EQ(message->reporterIDs, std::nullopt);
}

TEST_F(RpcFrameDecoderTest, TakesTheLargestNumbersOfEachParameter) {
  constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
  constexpr std::int64_t kMost = std::numeric_limits<std::int64_t>::max();
  const IncomingMessage* message =
      decodeMessage(frameOf({kPayload, 0xFFFF'FFFFU, 0xFFFF, Value(ValueArray({kLeast, kMost}))}));
  ASSERT_NE(message, nullptr);
  EXPECT_EQ(message->category, 0xFFFF'FFFFU);
  EXPECT_EQ(message->type, 0xFFFF);
  EXPECT_THAT(message->reporterIDs, Optional(ElementsAre(kLeast, kMost)));
}

TEST_F(RpcFrameDecoderTest, LeavesArgumentsThatDoNotFitToTheOtherWay) {
  EXPECT_FALSE(takes({}));
  EXPECT_FALSE(takes({kPayload, 4, 1}));
  EXPECT_FALSE(takes({kPayload, 4, 1, kIdentifiers, 5}));
  EXPECT_FALSE(takes({"text", 4, 1, kIdentifiers}));
  EXPECT_FALSE(takes({std::nullopt, 4, 1, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, std::nullopt, 1, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, std::int64_t{1} << 32, 1, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, -1, 1, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, 4.0, 1, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, true, 1, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, 4, 1 << 16, kIdentifiers}));
  EXPECT_FALSE(takes({kPayload, 4, 1, 77}));
  EXPECT_FALSE(takes({kPayload, 4, 1, kPayload}));
  EXPECT_FALSE(takes({kPayload, 4, 1, Value(ValueArray({1, "2"}))}));
  EXPECT_FALSE(takes({kPayload, 4, 1, Value(ValueArray({1, 2.0}))}));
  EXPECT_FALSE(takes({kPayload, 4, 1, Value(ValueArray({std::numeric_limits<std::uint64_t>::max()}))}));
}

TEST_F(RpcFrameDecoderTest, TakesExactlyTheMessagesWithoutAProblemAndReadsTheSame) {
  constexpr std::uint64_t kSeed = 20261122;
  RandomMaps maps(kSeed);
  const auto number = [&maps]() -> Argument {
    switch (maps.below(8)) {
      case 0:
        return std::nullopt;
      case 1:
        return -static_cast<std::int64_t>(maps.below(3));
      case 2:
        return 0.5;
      case 3:
        return (std::int64_t{1} << maps.below(63)) - static_cast<std::int64_t>(maps.below(2));
      default:
        return maps.below(20);
    }
  };
  int taken = 0;
  int left = 0;
  for (int round = 0; round < 5'000; ++round) {
    // Keys of a payload that can always be packed.
    Arguments arguments{ValueMap{{"level", round}, {maps.isOneIn(2) ? "device" : "other", "x"}}, number(),
                        number()};
    std::vector<Value> identifiers;
    while (!maps.isOneIn(3)) identifiers.push_back(number().value_or("nil"));
    arguments.push_back(maps.isOneIn(5) ? number() : Argument(ValueArray(std::move(identifiers))));
    const std::string bytes = frameOf(arguments);
    const bool hasProblem = problemWith(requests::kSendMessage, arguments).has_value();
    const IncomingMessage* message = decodeMessage(bytes);
    ASSERT_EQ(message == nullptr, hasProblem) << "seed " << kSeed << " round " << round;
    if (message == nullptr) {
      ++left;
      continue;
    }
    ++taken;
    const Arguments read = message->arguments();
    ASSERT_EQ(read, decoder.decode(bytes).arguments) << "seed " << kSeed << " round " << round;
  }
  EXPECT_GT(taken, 500);
  EXPECT_GT(left, 500);
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameScanner.h"

#include <algorithm>
#include <array>
#include <gmock/gmock.h>
#include <random>
#include <string>

#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/protobuf/Hex.h"

namespace tonewerk {
namespace {

using Result = RpcFrameScanner::Result;

// A request of "m" with these arguments, which include the header of their array.
std::string requestWith(std::string_view arguments) {
  return fromHex("94 00 01 A1 6D ") + fromHex(arguments);
}

// A request with `depth` arrays inside each other, the frame's own and that of the arguments counted.
std::string requestOfDepth(std::size_t depth) {
  std::string frame = fromHex("94 00 01 A1 6D");
  for (std::size_t open = 2; open < depth; ++open) frame += '\x91';
  return frame + '\x90';
}

// A request that is `size` bytes long.
std::string requestOfSize(std::size_t size) {
  std::string frame;
  RpcWriter(frame).request(1, "m", {Value(std::string(100'000, 'x'))});
  const std::size_t others = frame.size() - 100'000;
  frame.clear();
  RpcWriter(frame).request(1, "m", {Value(std::string(size - others, 'x'))});
  return frame;
}

std::string problemOf(std::string_view bytes) {
  RpcFrameScanner scanner;
  EXPECT_EQ(scanner.scan(bytes), Result::kBroken);
  return scanner.problem();
}

TEST(RpcFrameScannerTest, FindsARequestAndLeavesWhatFollows) {
  RpcFrameScanner scanner;
  const std::string request = fromHex("94 00 CE FFFFFFFF A4 6563686F 92 01 A3 6F6E65");
  const std::string bytes = request + "\x93";
  ASSERT_EQ(scanner.scan(bytes), Result::kFrame);
  EXPECT_FALSE(scanner.frame().isNotification);
  EXPECT_EQ(scanner.frame().identifier, 4294967295U);
  EXPECT_EQ(scanner.frame().method, "echo");
  EXPECT_EQ(scanner.frame().bytes, request.size());
}

TEST(RpcFrameScannerTest, FindsANotification) {
  RpcFrameScanner scanner;
  ASSERT_EQ(scanner.scan(fromHex("93 02 A4 6563686F 90")), Result::kFrame);
  EXPECT_TRUE(scanner.frame().isNotification);
  EXPECT_EQ(scanner.frame().bytes, 8U);
}

TEST(RpcFrameScannerTest, FindsFramesOneAfterTheOther) {
  RpcFrameScanner scanner;
  const std::string first = requestWith("91 81 A1 61 C3");
  const std::string second = requestWith("90");
  const std::string both = first + second;
  ASSERT_EQ(scanner.scan(both), Result::kFrame);
  EXPECT_EQ(scanner.frame().bytes, first.size());
  ASSERT_EQ(scanner.scan(std::string_view(both).substr(first.size())), Result::kFrame);
  EXPECT_EQ(scanner.frame().bytes, second.size());
}

TEST(RpcFrameScannerTest, GoesOnWhereItStoppedAlsoWhenTheBytesHaveMoved) {
  std::string frame;
  RpcWriter(frame).request(300, "method",
                           {Value(ValueMap{{"a", ValueArray{1, 2.0, "three"}}, {"b", Date{5}}}), Value(-7)});
  RpcFrameScanner scanner;
  for (std::size_t size = 0; size < frame.size(); ++size) {
    const std::string copy = frame.substr(0, size);
    ASSERT_EQ(scanner.scan(copy), Result::kNeedsMore) << size;
  }
  ASSERT_EQ(scanner.scan(frame), Result::kFrame);
  EXPECT_EQ(scanner.frame().bytes, frame.size());
  EXPECT_EQ(scanner.frame().method, "method");
  EXPECT_EQ(scanner.frame().identifier, 300U);
}

TEST(RpcFrameScannerTest, TakesTheLongestFrameAndRefusesALongerOne) {
  RpcFrameScanner scanner;
  EXPECT_EQ(scanner.scan(requestOfSize(kMaxFrameBytes)), Result::kFrame);
  EXPECT_EQ(problemOf(requestOfSize(kMaxFrameBytes + 1)), "a frame that is too long");
}

TEST(RpcFrameScannerTest, RefusesATextThatAnnouncesMoreThanAFrameHolds) {
  EXPECT_EQ(problemOf(requestWith("91 DB FFFFFFFF")), "a frame that is too long");
}

TEST(RpcFrameScannerTest, TakesTheDeepestFrameAndRefusesADeeperOne) {
  RpcFrameScanner scanner;
  EXPECT_EQ(scanner.scan(requestOfDepth(kMaxFrameDepth)), Result::kFrame);
  EXPECT_EQ(problemOf(requestOfDepth(kMaxFrameDepth + 1)), "a frame nested too deep");
}

TEST(RpcFrameScannerTest, SaysWhatIsWrongWithWhatIsNoFrame) {
  EXPECT_EQ(problemOf(fromHex("C1")), "bytes that are not MessagePack");
  EXPECT_EQ(problemOf(requestWith("91 C1")), "bytes that are not MessagePack");
  EXPECT_EQ(problemOf(fromHex("01")), "something that is no array");
  EXPECT_EQ(problemOf(fromHex("80")), "a map in a frame's place for something else");
  EXPECT_EQ(problemOf(fromHex("92")), "an array that is no frame");
  EXPECT_EQ(problemOf(fromHex("94 03")), "a frame of no known kind");
  EXPECT_EQ(problemOf(fromHex("94 C3")), "a frame of no known kind");
  EXPECT_EQ(problemOf(fromHex("94 02")), "a frame of the wrong length for its kind");
  EXPECT_EQ(problemOf(fromHex("94 00 CF 0000000100000000")),
            "a frame whose identifier is not a 32-bit number");
  EXPECT_EQ(problemOf(fromHex("94 00 FF")), "a frame whose identifier is not a 32-bit number");
  EXPECT_EQ(problemOf(fromHex("94 00 D0 FF")), "a frame whose identifier is not a 32-bit number");
  EXPECT_EQ(problemOf(fromHex("94 00 01 02")), "a frame whose method or arguments are something else");
  EXPECT_EQ(problemOf(fromHex("94 00 01 A1 6D 01")), "a frame whose method or arguments are something else");
  EXPECT_EQ(problemOf(fromHex("94 00 01 A1 FF 90")), "a frame whose method is not UTF-8");
}

TEST(RpcFrameScannerTest, TakesAResponseForBroken) {
  EXPECT_EQ(problemOf(fromHex("94 01 07 C0 C0")), "a response");
}

TEST(RpcFrameScannerTest, StaysBroken) {
  RpcFrameScanner scanner;
  EXPECT_EQ(scanner.scan(fromHex("C1")), Result::kBroken);
  EXPECT_EQ(scanner.scan(requestWith("90")), Result::kBroken);
}

// Makes random frames and damages some of them.
class RandomFrames {
 public:
  explicit RandomFrames(std::uint64_t seed) : random_(seed) {}

  std::string next() {
    Arguments arguments;
    for (std::size_t left = below(5); left > 0; --left) arguments.emplace_back(value(0));
    std::string frame;
    if (below(4) == 0) {
      RpcWriter(frame).notification("sendMessage", arguments);
    } else {
      RpcWriter(frame).request(static_cast<std::uint32_t>(random_()), "sendMessage", arguments);
    }
    for (std::size_t damages = below(3); damages > 0; --damages) {
      frame[below(frame.size())] = static_cast<char>(random_());
    }
    return frame;
  }

 private:
  std::size_t below(std::size_t limit) { return random_() % limit; }

  Value value(int depth) {
    switch (below(depth < 4 ? 9 : 7)) {
      case 0:
        return below(2) == 0;
      case 1:
        return static_cast<std::int64_t>(random_()) >> below(64);
      case 2:
        return random_() >> below(64);
      case 3:
        return static_cast<double>(random_()) / 3;
      case 4:
        return std::string(below(40), 'x');
      case 5:
        return Date{static_cast<double>(random_() >> 20U) / 1000};
      case 6:
        return "\xC3\xA4";
      case 7: {
        std::vector<Value> elements;
        for (std::size_t left = below(5); left > 0; --left) elements.push_back(value(depth + 1));
        return ValueArray(std::move(elements));
      }
      default: {
        ValueMap map;
        for (std::size_t left = below(20); left > 0; --left)
          map.set("key" + std::to_string(left), value(depth + 1));
        return map;
      }
    }
  }

  std::mt19937_64 random_;
};

TEST(RpcFrameScannerTest, FindsTheFramesThatTheReaderReads) {
  constexpr std::uint64_t kSeed = 20261122;
  RandomFrames frames(kSeed);
  RpcStrings texts;
  RpcFrameDecoder decoder;
  std::size_t readable = 0;
  int earlyRefusals = 0;
  for (int round = 0; round < 20'000; ++round) {
    const std::string bytes = frames.next();
    RpcFrameReader reader(texts);
    std::string_view rest = bytes;
    const RpcFrameReader::Result read = reader.next(rest);
    const bool isResponse =
        read == RpcFrameReader::Result::kFrame && reader.frame().kind == RpcFrame::Kind::kResponse;
    RpcFrameScanner scanner;
    const Result scanned = scanner.scan(bytes);
    if (isResponse) {
      ASSERT_EQ(scanned, Result::kBroken) << "seed " << kSeed << " round " << round;
      continue;
    }
    // The scanner needs only a value's first bytes to know that the value is wrong. The reader then finds no
    // frame either, however many bytes follow.
    if (read == RpcFrameReader::Result::kNeedsMore && scanned == Result::kBroken) {
      if (scanner.problem() == "a response" || ++earlyRefusals > 20) continue;
      const std::string more(kMaxFrameBytes, '\xC0');
      std::string_view following = more;
      ASSERT_EQ(reader.next(following), RpcFrameReader::Result::kBroken) << scanner.problem();
      continue;
    }
    ASSERT_EQ(static_cast<int>(scanned), static_cast<int>(read)) << "seed " << kSeed << " round " << round;
    if (scanned != Result::kFrame) continue;
    ++readable;
    const RpcFrame& expected = reader.frame();
    ASSERT_EQ(scanner.frame().bytes, expected.wireBytes);
    ASSERT_EQ(scanner.frame().method, expected.method);
    if (!scanner.frame().isNotification) ASSERT_EQ(scanner.frame().identifier, expected.identifier);
    const RpcFrame& decoded = decoder.decode(std::string_view(bytes).substr(0, scanner.frame().bytes));
    ASSERT_EQ(decoded.arguments, expected.arguments) << "seed " << kSeed << " round " << round;
    ASSERT_EQ(decoded.refused.has_value(), expected.refused.has_value());
  }
  EXPECT_GT(readable, 5'000U);
  EXPECT_GT(earlyRefusals, 20);
}

TEST(RpcFrameScannerTest, FindsTheSameInAWholeReadAsByteByByte) {
  constexpr std::uint64_t kSeed = 20261123;
  RandomFrames frames(kSeed);
  std::array<int, 3> results{};
  for (int round = 0; round < 500; ++round) {
    const std::string bytes = frames.next() + frames.next() + std::string(300, '\x07');
    RpcFrameScanner whole;
    RpcFrameScanner slow;
    const Result result = whole.scan(bytes);
    Result expected = Result::kNeedsMore;
    for (std::size_t size = 0; size <= bytes.size() && expected == Result::kNeedsMore; ++size) {
      expected = slow.scan(std::string_view(bytes).substr(0, size));
    }
    ASSERT_EQ(static_cast<int>(result), static_cast<int>(expected)) << "seed " << kSeed << " round " << round;
    ASSERT_EQ(whole.problem(), slow.problem());
    ++results.at(static_cast<std::size_t>(result));
    if (result != Result::kFrame) continue;
    const RpcFrameScanner::Frame& frame = whole.frame();
    ASSERT_EQ(frame.bytes, slow.frame().bytes);
    ASSERT_EQ(frame.isNotification, slow.frame().isNotification);
    if (!frame.isNotification) ASSERT_EQ(frame.identifier, slow.frame().identifier);
    ASSERT_EQ(frame.method.size(), slow.frame().method.size());
    ASSERT_EQ(frame.argumentCount, slow.frame().argumentCount);
    for (std::size_t at = 0; at < std::min(frame.argumentCount, RpcFrameScanner::kMaxKnownArguments); ++at) {
      ASSERT_EQ(frame.arguments.at(at), slow.frame().arguments.at(at)) << "round " << round;
    }
  }
  EXPECT_GT(results.at(static_cast<std::size_t>(Result::kFrame)), 100);
  EXPECT_GT(results.at(static_cast<std::size_t>(Result::kBroken)), 30);
}

// A text whose length takes a byte, and which ends behind the last byte, must not be taken for a whole one.
TEST(RpcFrameScannerTest, WaitsForTheEndOfATextAtTheEndOfTheBytes) {
  for (const std::size_t missing : {1U, 100U, 199U}) {
    std::string bytes;
    RpcWriter(bytes).request(
        1, "sendMessage", {Value(ValueMap{{"first", std::string(100, 'x')}, {"a", std::string(200, 'x')}})});
    RpcFrameScanner scanner;
    ASSERT_EQ(scanner.scan(std::string_view(bytes).substr(0, bytes.size() - missing)), Result::kNeedsMore);
    ASSERT_EQ(scanner.scan(bytes), Result::kFrame) << missing;
    EXPECT_EQ(scanner.frame().bytes, bytes.size());
  }
}

}  // namespace
}  // namespace tonewerk

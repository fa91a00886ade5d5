// SPDX-License-Identifier: Apache-2.0
#include "client/MessageRing.h"

#include <cstring>
#include <deque>
#include <gmock/gmock.h>
#include <numeric>
#include <rapidcheck/gtest.h>
#include <string>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {
namespace {

// Holds a ring and its session's count of losses.
struct Losses {
  LossCount losses;
};
class Ring : public Losses, public MessageRing {
 public:
  explicit Ring(std::size_t bytes) : MessageRing(bytes, losses) {}
};

// A payload with one text entry, `size` bytes long in all and filled with a character of choice, or with
// these bytes.
class Text {
 public:
  Text(std::size_t size, char fill) : Text(std::string(size, fill)) {}
  explicit Text(std::string bytes) : bytes_(std::move(bytes)) {
    twr_payload_init(&payload_, bytes_.data(), bytes_.size());
    payload_.size = payload_.capacity;
    payload_.entries = 1;
  }
  operator const twr_payload&() const { return payload_; }

 private:
  std::string bytes_;
  twr_payload payload_{};
};

std::string textOf(const RingMessage& message) { return {message.bytes.begin(), message.bytes.end()}; }

std::size_t takenBy(std::size_t bytes) {
  return MessageRing::kHeaderBytes + (bytes + MessageRing::kAlignmentBytes - 1) /
                                         MessageRing::kAlignmentBytes * MessageRing::kAlignmentBytes;
}

TEST(MessageRingTest, HasNothingAtFirst) {
  Ring ring(4096);
  EXPECT_FALSE(ring.front());
  EXPECT_EQ(ring.writtenPosition(), ring.readPosition());
  EXPECT_EQ(ring.dropped(), 0U);
}

TEST(MessageRingTest, RoundsItsSizeUpToAPowerOfTwo) {
  EXPECT_EQ(Ring(0).capacity(), MessageRing::kMinBytes);
  EXPECT_EQ(Ring(4096).capacity(), 4096U);
  EXPECT_EQ(Ring(4097).capacity(), 8192U);
  EXPECT_EQ(Ring(SIZE_MAX).capacity(), std::size_t{TWR_MOST_RING_BYTES});
}

TEST(MessageRingTest, GivesWhatWasPushedWithTheTimeOfThePush) {
  Ring ring(4096);
  const double before = coarseSeconds();
  ASSERT_EQ(ring.push(TWR_CATEGORY_VOLUME, TWR_TYPE_STATE, Text(10, 'a')), TWR_OK);
  const double after = coarseSeconds();
  const std::optional<RingMessage> message = ring.front();
  ASSERT_TRUE(message);
  EXPECT_EQ(message->category, TWR_CATEGORY_VOLUME);
  EXPECT_EQ(message->type, TWR_TYPE_STATE);
  EXPECT_EQ(message->entries, 1U);
  EXPECT_EQ(message->lostBefore, 0U);
  EXPECT_EQ(textOf(*message), std::string(10, 'a'));
  EXPECT_GE(message->time, before);
  EXPECT_LE(message->time, after);
}

TEST(MessageRingTest, TakesAPayloadWithoutEntriesAndWithoutMemory) {
  Ring ring(4096);
  twr_payload empty;
  twr_payload_init(&empty, nullptr, 0);
  ASSERT_EQ(ring.push(1, 0, empty), TWR_OK);
  ASSERT_TRUE(ring.front());
  EXPECT_EQ(ring.front()->entries, 0U);
  EXPECT_TRUE(ring.front()->bytes.empty());
}

TEST(MessageRingTest, KeepsTheFrontUntilItIsPopped) {
  Ring ring(4096);
  std::ignore = ring.push(1, 0, Text(5, 'a'));
  std::ignore = ring.push(2, 0, Text(5, 'b'));
  EXPECT_EQ(ring.front()->category, 1U);
  EXPECT_EQ(ring.front()->category, 1U);
  ring.pop();
  EXPECT_EQ(ring.front()->category, 2U);
  ring.pop();
  EXPECT_FALSE(ring.front());
}

TEST(MessageRingTest, HasReadWhatWasWrittenOnceItIsPopped) {
  Ring ring(4096);
  std::ignore = ring.push(1, 0, Text(5, 'a'));
  const std::uint64_t written = ring.writtenPosition();
  EXPECT_LT(ring.readPosition(), written);
  ASSERT_TRUE(ring.front());
  EXPECT_LT(ring.readPosition(), written);
  ring.pop();
  EXPECT_EQ(ring.readPosition(), written);
}

TEST(MessageRingTest, TakesAMessageThatFillsItToTheLastByte) {
  Ring ring(256);
  const std::size_t most = 256 - MessageRing::kHeaderBytes;
  ASSERT_EQ(ring.push(1, 0, Text(most, 'a')), TWR_OK);
  EXPECT_EQ(ring.push(1, 0, Text(0, 'b')), TWR_FULL);
  EXPECT_EQ(textOf(*ring.front()), std::string(most, 'a'));
  ring.pop();
  EXPECT_EQ(ring.push(1, 0, Text(0, 'b')), TWR_OK);
}

TEST(MessageRingTest, TakesTheLargestMessageAtAnyPlaceOfTheRing) {
  Ring ring(256);
  const std::size_t most = 256 - MessageRing::kHeaderBytes;
  for (std::size_t shift = 0; shift < 256; shift += MessageRing::kAlignmentBytes) {
    ASSERT_EQ(ring.push(7, 3, Text(most, static_cast<char>(shift))), TWR_OK);
    ASSERT_EQ(textOf(*ring.front()), std::string(most, static_cast<char>(shift)));
    ring.pop();
    ASSERT_EQ(ring.push(1, 0, Text(1, 'x')),
              TWR_OK);  // 40 bytes, so that messages begin at every place of the ring
    ASSERT_EQ(textOf(*ring.front()), "x");
    ring.pop();
  }
}

TEST(MessageRingTest, GivesEveryByteOfMessagesOfAllSizes) {
  Ring ring(1024);
  for (std::size_t size = 0; size <= 300; ++size) {
    std::string bytes(size, '\0');
    std::iota(bytes.begin(), bytes.end(), static_cast<char>(size));
    ASSERT_EQ(ring.push(1, 0, Text(bytes)), TWR_OK);
    ASSERT_EQ(textOf(*ring.front()), bytes);
    ring.pop();
  }
}

TEST(MessageRingTest, RefusesMessagesThatCanNeverFit) {
  Ring ring(256);
  EXPECT_EQ(ring.push(1, 0, Text(256 - MessageRing::kHeaderBytes + 1, 'a')), TWR_TOO_LARGE);
  EXPECT_EQ(ring.dropped(), 1U);
}

TEST(MessageRingTest, RefusesWhatNoFrameCanHold) {
  Ring ring(TWR_MOST_RING_BYTES);
  EXPECT_EQ(ring.push(1, 0, Text(kMaxFrameBytes, 'a')), TWR_TOO_LARGE);
  EXPECT_EQ(ring.push(1, 0, Text(kMaxFrameBytes - 1024, 'a')), TWR_OK);
}

TEST(MessageRingTest, ReturnsThePayloadsProblemAndCountsADrop) {
  Ring ring(4096);
  std::vector<unsigned char> memory(4);
  twr_payload payload;
  twr_payload_init(&payload, memory.data(), memory.size());
  ASSERT_EQ(twr_put_text(&payload, "name", "value"), TWR_TOO_LARGE);
  EXPECT_EQ(ring.push(1, 0, payload), TWR_TOO_LARGE);

  twr_payload_init_list(&payload, memory.data(), memory.size());
  EXPECT_EQ(ring.push(1, 0, payload), TWR_INVALID);
  EXPECT_FALSE(ring.front());
  EXPECT_EQ(ring.dropped(), 2U);
}

TEST(MessageRingTest, CarriesWithAMessageHowManyHadBeenLostBeforeIt) {
  Ring ring(64);
  ASSERT_EQ(ring.push(1, 0, Text(0, 'a')), TWR_OK);
  ASSERT_EQ(ring.push(2, 0, Text(0, 'b')), TWR_OK);
  EXPECT_EQ(ring.push(3, 0, Text(0, 'c')), TWR_FULL);
  EXPECT_EQ(ring.push(4, 0, Text(0, 'd')), TWR_FULL);
  EXPECT_EQ(ring.front()->lostBefore, 0U);
  ring.pop();
  ASSERT_EQ(ring.push(5, 0, Text(0, 'e')), TWR_OK);
  EXPECT_EQ(ring.front()->lostBefore, 0U);  // taken before the loss
  ring.pop();
  EXPECT_EQ(ring.front()->category, 5U);
  EXPECT_EQ(ring.front()->lostBefore, 2U);
  ring.pop();
  EXPECT_EQ(ring.dropped(), 2U);
}

TEST(MessageRingTest, AddsItsLossesToTheSessionsCount) {
  Ring ring(64);
  ring.losses.add(TWR_CATEGORY_VOLUME);
  ASSERT_EQ(ring.push(1, 0, Text(32, 'a')), TWR_OK);
  EXPECT_EQ(ring.front()->lostBefore, 1U);
  EXPECT_EQ(ring.push(TWR_CATEGORY_IO, 5, Text(0, 'b')), TWR_FULL);
  EXPECT_EQ(ring.losses.count(), 2U);
  EXPECT_EQ(ring.losses.lastCategory(), TWR_CATEGORY_IO);
  EXPECT_EQ(ring.dropped(), 1U);
}

// Models a ring of messages by a queue.
struct Model {
  struct Message {
    std::uint32_t category;
    std::string text;
    std::uint64_t dropped;
  };

  explicit Model(std::size_t bytes) : capacity(bytes) {}

  twr_status push(std::uint32_t category, const std::string& text) {
    const std::size_t needed = takenBy(text.size());
    if (needed > capacity || used + needed > capacity) {
      ++dropped;
      return needed > capacity ? TWR_TOO_LARGE : TWR_FULL;
    }
    used += needed;
    messages.push_back({category, text, dropped});
    return TWR_OK;
  }

  void pop() {
    used -= takenBy(messages.front().text.size());
    messages.pop_front();
  }

  std::size_t capacity;
  std::size_t used = 0;
  std::uint64_t dropped = 0;
  std::deque<Message> messages;
};

RC_GTEST_PROP(MessageRingTest, DoesWhatAQueueWithALimitDoes, ()) {
  const std::size_t capacity = std::size_t{64} << *rc::gen::inRange<unsigned>(0, 5);
  Ring ring(capacity);
  Model model(capacity);
  // A positive number pushes a text of that length; any other pops.
  const auto steps = *rc::gen::container<std::vector<int>>(rc::gen::weightedOneOf<int>(
      {{3, rc::gen::inRange(0, 100)}, {1, rc::gen::inRange(0, 1100)}, {3, rc::gen::just(-1)}}));
  std::uint32_t number = 0;
  for (const int step : steps) {
    if (step >= 0) {
      const Text text(static_cast<std::size_t>(step), static_cast<char>('a' + number % 26));
      const std::string same(static_cast<std::size_t>(step), static_cast<char>('a' + number % 26));
      RC_ASSERT(ring.push(number, 1, text) == model.push(number, same));
      ++number;
      continue;
    }
    const std::optional<RingMessage> front = ring.front();
    RC_ASSERT(front.has_value() == !model.messages.empty());
    if (!front) continue;
    RC_ASSERT(front->category == model.messages.front().category);
    RC_ASSERT(front->lostBefore == model.messages.front().dropped);
    RC_ASSERT(textOf(*front) == model.messages.front().text);
    ring.pop();
    model.pop();
  }
  RC_ASSERT(ring.writtenPosition() - ring.readPosition() == model.used);
}

TEST(MessageRingTest, LosesAndMixesNothingBetweenTwoThreads) {
  constexpr std::uint32_t kMessages = 20'000;
  Ring ring(512);  // small, so that it is often full and often wraps
  std::atomic<bool> isDone{false};
  std::thread producer([&] {
    for (std::uint32_t number = 0; number < kMessages; ++number) {
      std::ignore = ring.push(number, 1, Text(number % 97, static_cast<char>(number)));
    }
    isDone = true;
  });

  std::uint64_t taken = 0;
  const auto take = [&] {
    const std::optional<RingMessage> message = ring.front();
    if (!message) return false;
    // The messages taken and lost before this one are all earlier messages.
    EXPECT_EQ(message->category, taken + message->lostBefore);
    EXPECT_EQ(textOf(*message), std::string(message->category % 97, static_cast<char>(message->category)));
    ++taken;
    ring.pop();
    return true;
  };
  while (!isDone) take();
  producer.join();
  while (take()) {
  }
  EXPECT_EQ(taken + ring.losses.count(), kMessages);
}

}  // namespace
}  // namespace tonewerk

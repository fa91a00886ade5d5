// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/ReplyOutbox.h"

#include <array>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <sys/socket.h>
#include <thread>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/threads/BatchScope.h"

namespace tonewerk {
namespace {

std::string answerTo(std::uint32_t identifier) {
  std::string answer;
  RpcWriter(answer).response(identifier, std::nullopt, std::nullopt);
  return answer;
}

class ReplyOutboxTest : public testing::Test {
 protected:
  ReplyOutboxTest() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0, ends.data()), 0);
    own_ = FileDescriptor(ends[0]);
    peer_ = FileDescriptor(ends[1]);
    outbox = std::make_shared<ReplyOutbox>(own_.get(), std::make_shared<IoWaker>(), 1, beforeSending);
  }

  void reply(std::uint32_t identifier) { outbox->reply(identifier, std::nullopt, std::nullopt); }

  // What has been sent since the last call.
  std::string received() {
    std::array<char, 4096> room{};
    const ssize_t count = ::recv(peer_.get(), room.data(), room.size(), MSG_DONTWAIT);
    return {room.data(), count > 0 ? static_cast<std::size_t>(count) : 0};
  }

 private:
  FileDescriptor own_;
  FileDescriptor peer_;

 protected:
  std::function<void()> beforeSending;
  std::shared_ptr<ReplyOutbox> outbox;
};

TEST_F(ReplyOutboxTest, CallsWhatMustHappenBeforeBytesAreSent) {
  int calls = 0;
  std::string alreadySent = "not looked at";
  beforeSending = [&] {
    ++calls;
    alreadySent = received();
  };
  reply(1);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(alreadySent, "");
  EXPECT_EQ(received(), answerTo(1));
}

TEST_F(ReplyOutboxTest, SendsAtTheEndOfTheBatchWhatTheThreadHasGathered) {
  {
    const BatchScope batch;
    {
      const ReplyOutbox::Gathering gathering(*outbox);
      reply(1);
      reply(70'000);
      EXPECT_EQ(outbox->unsentBytes(), 0U);
    }
    EXPECT_EQ(outbox->unsentBytes(), (answerTo(1) + answerTo(70'000)).size());
    reply(3);
    EXPECT_EQ(received(), "");
  }
  EXPECT_EQ(received(), answerTo(1) + answerTo(70'000) + answerTo(3));
  EXPECT_EQ(outbox->unsentBytes(), 0U);
}

TEST_F(ReplyOutboxTest, SendsGatheredRepliesWhenABatchEndsMeanwhile) {
  const BatchScope batch;
  const ReplyOutbox::Gathering gathering(*outbox);
  for (int round = 0; round < 3; ++round) {
    reply(1);
    reply(2);
    for (std::size_t piece = 0; piece < BatchScope::kMaxPieces; ++piece) BatchScope::pieceHasRun();
    EXPECT_EQ(received(), answerTo(1) + answerTo(2)) << round;
  }
}

TEST_F(ReplyOutboxTest, SendsAtOnceWithoutABatch) {
  const ReplyOutbox::Gathering gathering(*outbox);
  reply(1);
  EXPECT_EQ(received(), answerTo(1));
}

TEST_F(ReplyOutboxTest, RepliesOfOtherThreadsDoNotWaitForTheGathering) {
  const BatchScope batch;
  const ReplyOutbox::Gathering gathering(*outbox);
  reply(1);
  std::thread([this] { reply(2); }).join();
  EXPECT_EQ(received(), answerTo(2));
}

TEST_F(ReplyOutboxTest, SendsWhatWasGatheredBeforeItCloses) {
  const BatchScope batch;
  {
    const ReplyOutbox::Gathering gathering(*outbox);
    reply(1);
    outbox->close();
    reply(2);
  }
  EXPECT_EQ(outbox->unsentBytes(), 0U);
  EXPECT_EQ(received(), answerTo(1));
}

TEST_F(ReplyOutboxTest, KeepsWhatAFullSocketDoesNotTake) {
  const std::string large(std::size_t{1} << 20U, 'x');
  std::string expected;
  {
    const BatchScope batch;
    const ReplyOutbox::Gathering gathering(*outbox);
    outbox->reply(1, std::nullopt, Value(large));
    reply(2);
  }
  RpcWriter(expected).response(1, std::nullopt, Value(large));
  expected += answerTo(2);
  std::string all;
  while (all.size() < expected.size()) {
    const std::string more = received();
    if (more.empty()) ASSERT_NE(outbox->flush(), ReplyOutbox::State::kRefused);
    all += more;
  }
  EXPECT_EQ(all, expected);
}

}  // namespace
}  // namespace tonewerk

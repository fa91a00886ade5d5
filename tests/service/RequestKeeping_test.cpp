// SPDX-License-Identifier: Apache-2.0
// Tests what the service keeps of its clients' requests in the journal, and when a session needs it no more.
#include <gmock/gmock.h>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "protocol/Requests.h"
#include "session/RequestJournal.h"
#include "support/ServiceTest.h"
#include "support/memory/MemoryJournal.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using Kind = Journal::Kind;

constexpr std::uint64_t kNothing = std::numeric_limits<std::uint64_t>::max();
constexpr std::uint32_t kAnna = 1001;

class RequestKeepingTest : public ServiceTest {
 public:
  ~RequestKeepingTest() override {
    messaging.shutDown();
    run();
  }

 protected:
  RequestKeepingTest() {
    service.reset();
    test.journal = &memory;
    useWorkers({});
    startService();
  }

  std::vector<Kind> kinds() {
    EXPECT_TRUE(memory.write());
    std::vector<Kind> found;
    for (const auto& [number, record] : disk->records) found.push_back(record.kind);
    return found;
  }
  static Arguments messageTo(const Argument& identifiers) {
    return {ValueMap{{"text", "hello"}}, 4, 1, identifiers};
  }

  const std::shared_ptr<MemoryJournalDisk> disk = std::make_shared<MemoryJournalDisk>();
  MemoryJournal memory{disk};
};

TEST_F(RequestKeepingTest, RequestsThatChangeSessionsAreKeptAfterWhoTheClientIs) {
  const auto anna = connect(11, kAnna);
  start(*anna, 77);
  ask(*anna, "sendMessage", messageTo(Value(ValueArray({Value(77)}))));
  EXPECT_THAT(kinds(), ElementsAre(Kind::kConnected, Kind::kRequest, Kind::kRequest, Kind::kRequest));
  for (const auto& [number, record] : disk->records) EXPECT_EQ(record.origin.user, kAnna);
}

TEST_F(RequestKeepingTest, RequestsThatOnlyReadAreNotKept) {
  const auto anna = connect(11, kAnna);
  ask(*anna, "getAllReporters", {});
  ask(*anna, "reporterIDValid", {77});
  anna->disconnect();
  run();
  EXPECT_THAT(kinds(), IsEmpty());
}

TEST_F(RequestKeepingTest, MessagesAreNotKeptWhileReportingIsDisabled) {
  service->setReportingEnabled(false);
  const auto anna = connect(11, kAnna);
  ask(*anna, "sendMessage", messageTo(std::nullopt));
  EXPECT_THAT(kinds(), IsEmpty());
}

TEST_F(RequestKeepingTest, TheEndOfAConnectionIsKeptBeforeItsSessionsStop) {
  const auto anna = connect(11, kAnna);
  create(*anna, 77);
  anna->disconnect();
  run();
  EXPECT_THAT(kinds(), ElementsAre(Kind::kConnected, Kind::kRequest, Kind::kDisconnected));
}

TEST_F(RequestKeepingTest, ASessionIsNeededUntilItsClientDestroysIt) {
  const auto anna = connect(11, kAnna);
  create(*anna, 77);
  EXPECT_EQ(context->journal().neededFrom(), 1U);
  create(*anna, 78);
  ask(*anna, "destroyReportingSession", {77});
  EXPECT_GT(context->journal().neededFrom(), 1U);
  ask(*anna, "destroyReportingSession", {78});
  EXPECT_EQ(context->journal().neededFrom(), kNothing);
}

TEST_F(RequestKeepingTest, ASessionThatChangesItsServiceIsNeededFromItsBegin) {
  const auto anna = connect(11, kAnna);
  create(*anna, 77);
  ask(*anna, "setServiceType", {7, 77});
  EXPECT_EQ(context->journal().neededFrom(), 1U);
}

TEST_F(RequestKeepingTest, TheEndOfASingleMessageSessionIsKept) {
  const auto anna = connect(11, kAnna);
  ask(*anna, "sendMessage", messageTo(std::nullopt));
  EXPECT_NE(context->journal().neededFrom(), kNothing);
  test.clock.advance(6.0);
  run();
  EXPECT_THAT(service->currentSingleMessageSessions(), IsEmpty());
  EXPECT_EQ(context->journal().neededFrom(), kNothing);
  ASSERT_THAT(kinds(), SizeIs(3));
  EXPECT_EQ(kinds().back(), Kind::kSingleMessagesEnded);
}

TEST_F(RequestKeepingTest, WithoutRoomForASessionNothingIsNeededForIt) {
  test.accounts.totals().setTotal(Resource::kKeptBytes, 0);
  const auto anna = connect(11, kAnna);
  ask(*anna, "createReportingSession", {77});
  EXPECT_EQ(context->journal().neededFrom(), kNothing);
}

TEST_F(RequestKeepingTest, AClientWhoseRecordMayHaveGoneSaysAgainWhoItIs) {
  const auto anna = connect(11, kAnna);
  ask(*anna, "sendMessage", messageTo(std::nullopt));
  ask(*anna, "sendMessage", messageTo(std::nullopt));
  ASSERT_THAT(kinds(), ElementsAre(Kind::kConnected, Kind::kRequest, Kind::kRequest));
  context->journal().willDrop(memory.last() + 1);
  ask(*anna, "sendMessage", messageTo(std::nullopt));
  EXPECT_THAT(kinds(), ElementsAre(Kind::kConnected, Kind::kRequest, Kind::kRequest, Kind::kConnected,
                                   Kind::kRequest));
}

TEST_F(RequestKeepingTest, AClientThatSendsToALaterSessionOfAnotherSaysAgainWhoItIs) {
  const auto first = connect(11, kAnna);
  const auto second = connect(12, kAnna);
  create(*first, 76);
  create(*second, 77);
  ASSERT_TRUE(memory.write());
  memory.drop(memory.last() + 1);
  ask(*first, "sendMessage", messageTo(Value(ValueArray({Value(77)}))));
  EXPECT_THAT(kinds(), ElementsAre(Kind::kConnected, Kind::kRequest));
  ask(*first, "sendMessage", messageTo(Value(ValueArray({Value(77)}))));
  EXPECT_THAT(kinds(), ElementsAre(Kind::kConnected, Kind::kRequest, Kind::kRequest));
}

// A session that has ended leaves requests in the journal whose segment is still needed.
TEST_F(RequestKeepingTest, APlayedMessageForASessionWhoseBeginningIsGoneIsNoError) {
  const auto anna = connect(11, kAnna);
  run();
  const Arguments toOne = messageTo(Value(ValueArray({Value(77)})));
  const Arguments toTwo = messageTo(Value(ValueArray({Value(77), Value(78)})));
  context->journal().play({.sequence = 5, .origin = {.at = 1.0, .client = 1, .user = kAnna}, .bytes = {}});
  ask(*anna, "sendMessage", toOne);
  ask(*anna, "sendMessage", toTwo);
  EXPECT_THAT(test.log.textsAt(LogLevel::kError), IsEmpty());
  context->journal().endPlaying();
  ask(*anna, "sendMessage", toOne);
  ask(*anna, "sendMessage", toTwo);
  EXPECT_THAT(test.log.textsAt(LogLevel::kError), SizeIs(2));
}

}  // namespace
}  // namespace tonewerk

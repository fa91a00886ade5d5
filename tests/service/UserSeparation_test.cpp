// SPDX-License-Identifier: Apache-2.0
#include <chrono>
#include <cstddef>
#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "platform/accounts/TurnQueue.h"
#include "protocol/Requests.h"
#include "session/TWReportingSessionWorkerClass.h"
#include "session/TWReportingSessionWorkerConsumerProtocol.h"
#include "support/ServiceTest.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

constexpr std::uint32_t kAnna = 1001;
constexpr std::uint32_t kBen = 1002;
constexpr AudioEventCategory kCategory = 4;
constexpr AudioEventType kType = 3;

Value listOf(const std::vector<ReporterID>& identifiers) {
  std::vector<Value> list(identifiers.begin(), identifiers.end());
  return ValueArray(std::move(list));
}

// Takes longer than a turn for each message and for its stop.
class SlowWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static inline ManualClock* clock = nullptr;

  explicit SlowWorker(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  std::optional<bool> start() override { return true; }
  void stop() override { clock->advance(kTime); }
  bool handleMessage(const TWReportingSessionMessage& /*message*/) override {
    clock->advance(kTime);
    return true;
  }

 private:
  static constexpr auto kTime = 2 * TurnQueue::kTurn;
};
const TWReportingSessionWorkerClass SlowWorker::kWorkerClass = workerClassOf<SlowWorker>("SlowWorker");

class UserSeparationTest : public ServiceTest {
 protected:
  UserSeparationTest() : ServiceTest({&SlowWorker::kWorkerClass}) { SlowWorker::clock = &test.clock; }

  Arguments messageTo(const Argument& identifiers, const std::string& text = "hello") {
    return {ValueMap{{"text", text}}, kCategory, kType, identifiers};
  }
  // The texts that a session has stored.
  std::vector<std::string> textsOf(std::size_t client, ReporterID reporterID) {
    return textsIn(*sessionOf(client, reporterID));
  }
  static std::vector<std::string> textsIn(const TWReportingSession& session) {
    std::vector<std::string> texts;
    for (const auto* stored : session.messages()) {
      if (const Value* text = stored->message.find("text")) texts.push_back(text->text());
    }
    return texts;
  }

  const std::shared_ptr<Account> anna_ = test.accounts.of(kAnna);
  const std::shared_ptr<Account> ben_ = test.accounts.of(kBen);
  std::unique_ptr<MemoryClient> ben = connect(12, kBen);
  std::unique_ptr<MemoryClient> anna = connect(11, kAnna);
  std::unique_ptr<MemoryClient> root = connect(10, 0);
};

TEST_F(UserSeparationTest, AMessageGoesToTheSendersOwnSessionOfAnIdentifier) {
  start(*ben, 77);
  start(*anna, 77);
  ask(*anna, "sendMessage", messageTo(listOf({77}), "of anna"));
  EXPECT_THAT(textsOf(0, 77), IsEmpty());
  EXPECT_THAT(textsOf(1, 77), ElementsAre("of anna"));
}

TEST_F(UserSeparationTest, AnotherUsersIdentifierIsUnknown) {
  start(*ben, 77);
  ask(*anna, "sendMessage", messageTo(listOf({77})));
  EXPECT_THAT(textsOf(0, 77), IsEmpty());
  EXPECT_EQ(askOnce(*anna, "getServiceNameForReporterID", {77}), Value(kServiceUnknown));
  EXPECT_EQ(askOnce(*anna, "reporterIDValid", {77}).asMap()->integer("reporterID"), 0);
  EXPECT_EQ(askOnce(*ben, "reporterIDValid", {77}).asMap()->integer("reporterID"), 77);
}

TEST_F(UserSeparationTest, AnotherClientOfTheSameUserIsReachedAsBefore) {
  const auto second = connect(13, kAnna);
  start(*anna, 77);
  ask(*second, "sendMessage", messageTo(listOf({77}), "of the second"));
  EXPECT_THAT(textsOf(1, 77), ElementsAre("of the second"));
  EXPECT_EQ(askOnce(*second, "reporterIDValid", {77}).asMap()->integer("reporterID"), 77);
}

TEST_F(UserSeparationTest, AListHoldsTheUsersOwnIdentifiers) {
  create(*ben, 1);
  create(*anna, 2);
  EXPECT_EQ(askOnce(*anna, "getAllReporters", {}), Value(ValueArray{2}));
  EXPECT_EQ(askOnce(*ben, "getAllReporters", {}), Value(ValueArray{1}));
  EXPECT_EQ(askOnce(*root, "getAllReporters", {}), Value(ValueArray{1, 2}));
}

TEST_F(UserSeparationTest, ABroadcastGoesToTheUsersOwnSessions) {
  start(*ben, 1);
  start(*anna, 2);
  ask(*anna, "sendMessage", messageTo(std::nullopt, "of anna"));
  EXPECT_THAT(textsOf(0, 1), IsEmpty());
  EXPECT_THAT(textsOf(1, 2), ElementsAre("of anna"));
}

TEST_F(UserSeparationTest, ATrustedUserReachesAllSessions) {
  start(*ben, 77);
  start(*anna, 77);
  ask(*root, "sendMessage", messageTo(listOf({77}), "to one"));  // of the client that connected first
  ask(*root, "sendMessage", messageTo(std::nullopt, "to all"));
  EXPECT_THAT(textsOf(0, 77), ElementsAre("to one", "to all"));
  EXPECT_THAT(textsOf(1, 77), ElementsAre("to all"));
}

TEST_F(UserSeparationTest, AUserWhoBecomesTrustedReachesAllSessions) {
  start(*ben, 77);
  test.accounts.setTrustedUsers({kAnna});
  ask(*anna, "sendMessage", messageTo(listOf({77}), "of anna"));
  EXPECT_THAT(textsOf(0, 77), ElementsAre("of anna"));
}

TEST_F(UserSeparationTest, EachUserHasASingleMessageSession) {
  start(*ben, 1);  // Anna's messages do not go there
  ask(*anna, "sendMessage", messageTo(std::nullopt, "of anna"));
  ask(*root, "stopReportingSessionForID", {1});
  ask(*ben, "stopReportingSessionForID", {1});
  ask(*ben, "sendMessage", messageTo(std::nullopt, "of ben"));
  const auto sessions = service->currentSingleMessageSessions();
  ASSERT_THAT(sessions, SizeIs(2));
  EXPECT_THAT(textsIn(*sessions[0]), ElementsAre("of anna"));
  EXPECT_THAT(textsIn(*sessions[1]), ElementsAre("of ben"));
  test.clock.advance(6.0);
  run();
  EXPECT_THAT(service->currentSingleMessageSessions(), IsEmpty());
}

TEST_F(UserSeparationTest, OneUsersSingleMessageSessionEndsWhileAnothersLives) {
  ask(*anna, "sendMessage", messageTo(std::nullopt));
  test.clock.advance(4.0);
  ask(*ben, "sendMessage", messageTo(std::nullopt, "of ben"));
  test.clock.advance(3.0);
  run();
  const auto left = service->currentSingleMessageSessions();
  ASSERT_THAT(left, SizeIs(1));
  EXPECT_THAT(textsIn(*left[0]), ElementsAre("of ben"));
  test.clock.advance(3.0);
  run();
  EXPECT_THAT(service->currentSingleMessageSessions(), IsEmpty());
}

TEST_F(UserSeparationTest, OnlyATrustedUserMayEndTheProcess) {
  const auto answers = ask(*anna, "killService", {});
  ASSERT_THAT(answers, SizeIs(1));
  ASSERT_TRUE(answers[0].error);
  EXPECT_EQ(answers[0].error->code, kNotPermitted);
  EXPECT_EQ(processEnds, 0);
  root->request("killService", {});
  run();
  EXPECT_EQ(processEnds, 1);
}

TEST_F(UserSeparationTest, AMessageToManySessionsLetsOthersHaveTheirTurns) {
  constexpr std::size_t kSessions = 20;
  std::vector<ReporterID> all;
  for (ReporterID reporterID = 1; reporterID <= static_cast<ReporterID>(kSessions); ++reporterID) {
    start(*anna, reporterID);
    all.push_back(reporterID);
  }
  const auto sent = anna->request("sendMessage", messageTo(listOf(all)));
  const auto after = anna->request("reporterIDValid", {1});
  std::vector<std::size_t> reached;  // how many sessions have the message, in Ben's turns
  context->turns().add(ben_, [&] {
    std::size_t count = 0;
    for (const ReporterID reporterID : all) count += textsOf(1, reporterID).size();
    reached.push_back(count);
    return count < kSessions ? TurnQueue::Progress::kMore : TurnQueue::Progress::kDone;
  });
  run();
  EXPECT_THAT(reached, SizeIs(testing::Gt(kSessions / 2)));
  const auto responses = anna->responses();
  ASSERT_GE(responses.size(), 2U);
  EXPECT_EQ(responses[responses.size() - 2].identifier, sent);
  EXPECT_EQ(responses.back().identifier, after);
  EXPECT_EQ(test.accounts.of(kAnna)->held(Resource::kUnfinishedBytes), 0U);
}

TEST_F(UserSeparationTest, UnknownIdentifiersOfOneRequestAreOneLine) {
  test.log.clear();
  ask(*anna, "sendMessage", messageTo(listOf({5})));
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kError),
              ElementsAre(testing::HasSubstr("failed to find reporting session 5")));
  test.log.clear();
  create(*anna, 7);
  ask(*anna, "sendMessage", messageTo(listOf({5, 0, 7, 6, 5}), "found"));
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kError),
              ElementsAre(testing::HasSubstr("failed to find reporting session 5 and 2 others")));
  EXPECT_THAT(textsOf(1, 7), ElementsAre("found"));
}

TEST_F(UserSeparationTest, ATrustedSenderPaysForWhatAnothersSessionKeeps) {
  start(*anna, 77);
  const Account& payer = *test.accounts.of(0);
  const std::uint64_t before = test.accounts.of(kAnna)->held(Resource::kKeptBytes);
  for (int number = 0; number < 40; ++number) {
    ask(*root, "sendMessage",
        messageTo(listOf({77}), std::string(10'000, static_cast<char>('a' + number % 26))));
  }
  EXPECT_THAT(textsOf(1, 77), SizeIs(40));
  EXPECT_GT(payer.held(Resource::kKeptBytes), 400'000U);
  EXPECT_LT(test.accounts.of(kAnna)->held(Resource::kKeptBytes), before + 60'000);
  ask(*anna, "stopReportingSessionForID", {77});
  EXPECT_LT(payer.held(Resource::kKeptBytes), 40'000U);
}

TEST_F(UserSeparationTest, ASenderWithoutAShareLeftTakesNoRoomFromTheSession) {
  start(*anna, 77);
  test.accounts.totals().setTotal(Resource::kKeptBytes, 200'000);
  for (int number = 0; number < 40; ++number) {
    ask(*root, "sendMessage",
        messageTo(listOf({77}), std::string(10'000, static_cast<char>('a' + number % 26))));
  }
  const std::size_t kept = textsOf(1, 77).size();
  EXPECT_LT(kept, 12U);
  ask(*anna, "sendMessage", messageTo(listOf({77}), "of anna"));
  EXPECT_EQ(textsOf(1, 77).size(), kept + 1);
  EXPECT_GT(test.accounts.of(0)->refused(Resource::kKeptBytes), 0U);
}

TEST_F(UserSeparationTest, ADisconnectionGivesBackWhatItsSessionsKept) {
  start(*anna, 77);
  for (int number = 0; number < 40; ++number) {
    ask(*anna, "sendMessage",
        messageTo(listOf({77}), std::string(10'000, static_cast<char>('a' + number % 26))));
  }
  EXPECT_GT(test.accounts.of(kAnna)->held(Resource::kKeptBytes), 400'000U);
  anna->disconnect();
  run();
  anna = nullptr;
  EXPECT_EQ(test.accounts.of(kAnna)->held(Resource::kKeptBytes), 0U);
}

TEST_F(UserSeparationTest, ALongDisconnectionLetsOthersHaveTheirTurns) {
  constexpr std::size_t kSessions = 10;
  for (ReporterID reporterID = 1; reporterID <= static_cast<ReporterID>(kSessions); ++reporterID) {
    start(*anna, reporterID);
  }
  anna->disconnect();
  std::vector<std::size_t> running;  // Anna's sessions, in Ben's turns
  context->turns().add(ben_, [&] {
    running.push_back(service->getAllActiveReportingSessions(*owner()).size());
    return running.back() > 0 ? TurnQueue::Progress::kMore : TurnQueue::Progress::kDone;
  });
  run();
  EXPECT_EQ(service->getAllClients().size(), 2U);
  EXPECT_THAT(running, SizeIs(testing::Gt(kSessions / 2)));
}

TEST_F(UserSeparationTest, ATrustedUsersOwnSessionComesFirst) {
  start(*ben, 77);
  start(*root, 77);
  ask(*root, "sendMessage", messageTo(listOf({77}), "of root"));
  EXPECT_THAT(textsOf(0, 77), IsEmpty());
  EXPECT_THAT(textsOf(2, 77), ElementsAre("of root"));
}

TEST_F(UserSeparationTest, SessionsThatDoNotFitIntoTheUsersShareAreRefused) {
  test.accounts.totals().setTotal(Resource::kKeptBytes, 4 * KeptBytesBudget::kLotBytes);
  std::size_t created = 0;
  for (ReporterID reporterID = 1; reporterID <= 20; ++reporterID) {
    const auto answers = ask(*anna, "createReportingSession", {reporterID});
    ASSERT_THAT(answers, SizeIs(1));
    if (answers[0].error) {
      EXPECT_EQ(answers[0].error->code, kOverLimit);
    } else {
      ++created;
    }
  }
  EXPECT_EQ(created, 2 * KeptBytesBudget::kLotBytes / TWReportingSession::kOwnBytes);
  create(*ben, 1);
  ask(*anna, "destroyReportingSession", {1});
  create(*anna, 21);
}

}  // namespace
}  // namespace tonewerk

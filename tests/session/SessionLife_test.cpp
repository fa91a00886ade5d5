// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <vector>

#include "session/TWReportingSession.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

// What a session enters in the book of lives.
class SessionLifeTest : public ReportingTest {
 protected:
  using Entry = MemorySessionBook::Entry;

  std::vector<Entry> entries() const { return test.sessionBook.entries(); }
  static void send(TWReportingSession& session, ValueMap payload) {
    TWReportingSessionMessage message(std::move(payload), kCategoryIo, kTypeGeneric);
    session.sendMessage(message);
  }
};

TEST_F(SessionLifeTest, BeginsWithTheStartAndEndsWithTheStop) {
  const auto session = makeSession(77);
  session->setServiceType(2);
  session->setOwnerProcessName(SharedString("phone"));
  const ValueMap configuration{{"HostApplicationDisplayID", "org.example.Phone"}};
  ASSERT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  EXPECT_THAT(entries(), IsEmpty());

  const double begin = test.clock.now();
  session->start();
  ASSERT_THAT(entries(), SizeIs(1));
  const Entry first = entries()[0];
  EXPECT_EQ(first.life->beginning.reporterID, 77);
  EXPECT_EQ(first.life->beginning.at, begin);
  EXPECT_EQ(first.life->beginning.request, 0U);
  EXPECT_EQ(first.life->beginning.service, "telephony");
  EXPECT_EQ(first.application, "org.example.Phone");
  EXPECT_EQ(first.process, "phone");
  EXPECT_EQ(first.end, std::nullopt);

  test.clock.advance(5.0);
  session->stop();
  ASSERT_THAT(entries(), SizeIs(2));
  const Entry last = entries()[1];
  EXPECT_EQ(last.life, first.life);
  ASSERT_TRUE(last.end);
  EXPECT_EQ(last.end->at, begin + 5.0);
  EXPECT_EQ(last.end->ending, SessionEnding::kStopped);
}

TEST_F(SessionLifeTest, TellsWhatItReceivedAndNeverLessThanNothing) {
  const auto session = makeSession();
  session->start();
  send(*session, {{"a", 1}});
  send(*session, {{"a", 1}});
  send(*session, {{"a", 2}});
  session->countActivity(2.0);
  session->countActivity(3.5);
  session->countOverload();
  session->stop();
  const SessionEnd end = *entries().back().end;
  EXPECT_EQ(end.messages, 3U);
  EXPECT_EQ(end.redundantMessages, 1U);
  EXPECT_EQ(end.activeSeconds, 5.5);
  EXPECT_EQ(end.overloads, 1U);
}

TEST_F(SessionLifeTest, ASessionThatStartsAgainHasANewLifeWithCountsOfItsOwn) {
  const auto session = makeSession();
  session->start();
  send(*session, {{"a", 1}});
  session->countActivity(2.0);
  session->countOverload();
  session->stop();
  session->start();
  session->stop();
  ASSERT_THAT(entries(), SizeIs(4));
  EXPECT_NE(entries()[2].life, entries()[0].life);
  const SessionEnd end = *entries()[3].end;
  EXPECT_EQ(end.messages, 0U);
  EXPECT_EQ(end.activeSeconds, 0.0);
  EXPECT_EQ(end.overloads, 0U);
}

TEST_F(SessionLifeTest, ALifeThatIsAskedForBeforeTheStartIsTheSameAfterIt) {
  const auto session = makeSession();
  const auto life = session->life();
  session->start();
  EXPECT_EQ(session->life(), life);
  EXPECT_THAT(entries(), SizeIs(1));
}

TEST_F(SessionLifeTest, ANewApplicationIsEntered) {
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(entries().back().application, "");  // not "Unknown"
  const ValueMap configuration{{"HostApplicationDisplayID", "org.example.Player"}};
  ASSERT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  EXPECT_EQ(entries().back().application, "org.example.Player");
  EXPECT_EQ(entries().back().end, std::nullopt);
  EXPECT_EQ(entries().back().life, session->life());
}

TEST_F(SessionLifeTest, SaysHowItEnded) {
  const auto session = makeSession();
  session->start();
  session->stop(SessionEnding::kDisconnected);
  EXPECT_EQ(entries().back().end->ending, SessionEnding::kDisconnected);
}

TEST_F(SessionLifeTest, AnUnstartedSessionsLifeEndsOnceWhenItIsGivenUp) {
  const auto session = makeSession();
  session->endLife(SessionEnding::kReplaced);
  EXPECT_THAT(entries(), IsEmpty());  // it has had none
  (void)session->life();
  session->endLife(SessionEnding::kReplaced);
  session->endLife(SessionEnding::kStopped);
  ASSERT_THAT(entries(), SizeIs(2));
  EXPECT_EQ(entries().back().end->ending, SessionEnding::kReplaced);
}

}  // namespace
}  // namespace tonewerk

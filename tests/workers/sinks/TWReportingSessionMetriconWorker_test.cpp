// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionMetriconWorker.h"

#include <gtest/gtest.h>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class TWReportingSessionMetriconWorkerTest : public ReportingTest {
 protected:
  bool handle(AudioEventCategory category, AudioEventType type, const ValueMap& payload = {{"a", 1}}) {
    return worker.handleMessage(TWReportingSessionMessage(payload, category, type));
  }

  std::shared_ptr<TWReportingSession> session = makeSession();
  TWReportingSessionMetriconWorker worker{session};
};

TEST_F(TWReportingSessionMetriconWorkerTest, IsAConsumerFromTheSessionsCreationAlsoInSingleMessageSessions) {
  const auto& workerClass = TWReportingSessionMetriconWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_TRUE(workerClass.startOnInit);
  EXPECT_TRUE(workerClass.handleSingleMessageSession);
  EXPECT_FALSE(worker.handleRedundantMessages());
}

TEST_F(TWReportingSessionMetriconWorkerTest, SendsAMessageUnderTheFrameworksNameAndThenItsServices) {
  session->setServiceType(2);
  EXPECT_FALSE(handle(4, 2));
  EXPECT_THAT(test.metricon.names(),
              ElementsAre("com.orvane.tonewerk.Playback.Stop", "com.orvane.telephony.Playback.Stop"));
}

TEST_F(TWReportingSessionMetriconWorkerTest, TheDomainIsPartOfTheName) {
  handle(0x20000004, 2);
  EXPECT_EQ(test.metricon.names().front(), "com.orvane.tonewerk.HAL_Playback.Stop");
}

TEST_F(TWReportingSessionMetriconWorkerTest, ACategoryWithoutANameIsUndefined) {
  handle(0, 1);
  EXPECT_EQ(test.metricon.names().front(), "com.orvane.tonewerk.Undefined.Start");
}

TEST_F(TWReportingSessionMetriconWorkerTest, AServiceOutsideTheTableIsUnknown) {
  handle(4, 2);
  EXPECT_EQ(test.metricon.names().back(), "com.orvane.unknown.Playback.Stop");
}

TEST_F(TWReportingSessionMetriconWorkerTest, PassesThePayloadAsItIs) {
  const ValueMap payload{{"a", 1}, {"nested", ValueMap{{"x", 1}}}};
  handle(4, 2, payload);
  ASSERT_THAT(test.metricon.events(), SizeIs(2));
  for (const auto& event : test.metricon.events()) EXPECT_EQ(event.payload, payload);
}

TEST_F(TWReportingSessionMetriconWorkerTest, SaysWhatTheEventIsAbout) {
  TWReportingSessionMessage message({{"a", 1}}, kCategoryVolume, kTypeSummary);
  message.isDerived = true;
  message.details.setStretch({1.0, 3.5});
  worker.handleMessage(message);
  handle(4, 2);
  ASSERT_THAT(test.metricon.events(), SizeIs(4));
  const EventSubject derived = test.metricon.events()[0].subject;
  EXPECT_EQ(derived.category, kCategoryVolume);
  EXPECT_EQ(derived.type, kTypeSummary);
  EXPECT_EQ(derived.source, EventSource::kDerived);
  EXPECT_EQ(derived.life, session->life());
  EXPECT_EQ(derived.stretch, (TimeStretch{1.0, 3.5}));
  const EventSubject sent = test.metricon.events()[2].subject;
  EXPECT_EQ(sent.source, EventSource::kClient);
  EXPECT_EQ(sent.life, session->life());
  EXPECT_EQ(sent.stretch, std::nullopt);
}

TEST_F(TWReportingSessionMetriconWorkerTest, WhenNeitherNameIsInUseNothingIsSentAndTheAnswerIsStillFalse) {
  test.metricon.useOnly(std::vector<std::string>{});
  EXPECT_FALSE(handle(4, 2));
  EXPECT_THAT(test.metricon.events(), IsEmpty());
  EXPECT_THAT(test.log.linesOf("twrr", LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingSessionMetriconWorkerTest, SendsOnlyTheNameThatIsInUse) {
  session->setServiceType(2);
  test.metricon.useOnly({"com.orvane.telephony.*"});
  handle(4, 2);
  EXPECT_THAT(test.metricon.names(), ElementsAre("com.orvane.telephony.Playback.Stop"));
}

TEST_F(TWReportingSessionMetriconWorkerTest, DropsNoRepeats) {
  handle(4, 2);
  handle(4, 2);
  EXPECT_THAT(test.metricon.events(), SizeIs(4));
}

TEST_F(TWReportingSessionMetriconWorkerTest, AMessageAfterTheSessionsEndGoesUnderTheGenericService) {
  session->setServiceType(2);
  session.reset();
  handle(4, 2);
  EXPECT_EQ(test.metricon.names().back(), "com.orvane.generic.Playback.Stop");
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue.h"

#include <gtest/gtest.h>
#include <limits>

#include "workers/diagnostics/CapsaTest.h"

namespace tonewerk {
namespace {

class TWReportingCapsaWorkerInstanceVcqDestroyRecordQueueTest : public CapsaTest {
 protected:
  std::shared_ptr<TWReportingSession> session = makeSessionOf(kServiceAlarms);
  TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue instance;
};

TEST_F(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueueTest, HasNoThresholds) {
  EXPECT_EQ(instance.workerState().interestThresholdCount, -1);
  EXPECT_EQ(instance.workerState().interestThresholdDurationSeconds, std::numeric_limits<double>::max());
  EXPECT_FALSE(instance.workerState().oncePerSession);
}

TEST_F(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueueTest, IsNotMadeForSingleMessageSessions) {
  EXPECT_NE(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::initWithSession(session), nullptr);
  session->setSingleMessageSession(true);
  EXPECT_EQ(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::initWithSession(session), nullptr);
  EXPECT_FALSE(
      TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue::kInstanceClass.handleSingleMessageSession);
}

TEST_F(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueueTest, IsNeverInterestedAndNeverFires) {
  EXPECT_FALSE(instance.canFire());
  for (AudioEventCategory category = 0; category <= 17; ++category) {
    for (AudioEventType type = 0; type <= 20; ++type) {
      const TWReportingSessionMessage message({{"issue_type", "LowRMS"}}, category, type);
      EXPECT_FALSE(instance.interestedInMessage(message));
    }
  }
}

TEST_F(TWReportingCapsaWorkerInstanceVcqDestroyRecordQueueTest, DoesNothingWithMessages) {
  instance.handleMessage(TWReportingSessionMessage({{"a", 1}}, 1, 1));
  EXPECT_EQ(instance.workerState().interestedCount, 0);
  EXPECT_TRUE(test.log.linesOf("twrb").empty());
}

}  // namespace
}  // namespace tonewerk

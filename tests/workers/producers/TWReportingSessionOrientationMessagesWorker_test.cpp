// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionOrientationMessagesWorker.h"

#include <gtest/gtest.h>

#include "support/ReportingTest.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::Not;

class TWReportingSessionOrientationMessagesWorkerTest : public ReportingTest {};

TEST_F(TWReportingSessionOrientationMessagesWorkerTest, CannotBeMadeAndDoesNotKeepTheSession) {
  auto session = makeSession();
  EXPECT_EQ(TWReportingSessionOrientationMessagesWorker::initWithSession(session), nullptr);
  EXPECT_EQ(TWReportingSessionOrientationMessagesWorker::initWithSession(nullptr), nullptr);
  EXPECT_EQ(session.use_count(), 1);
}

TEST_F(TWReportingSessionOrientationMessagesWorkerTest, IsAProducerOutsideTheRegistry) {
  const auto& workerClass = TWReportingSessionOrientationMessagesWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.isConsumer);
  EXPECT_THAT(allWorkerClasses(), Not(Contains(&workerClass)));
}

}  // namespace
}  // namespace tonewerk

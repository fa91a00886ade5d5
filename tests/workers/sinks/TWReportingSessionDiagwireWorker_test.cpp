// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionDiagwireWorker.h"

#include <gtest/gtest.h>
#include <string>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Post = MemoryDiagwire::Post;

constexpr AudioEventType kIssueDetector = 7;

class TWReportingSessionDiagwireWorkerTest : public ReportingTest {
 protected:
  bool handle(const ValueMap& payload, AudioEventType type = kIssueDetector,
              AudioEventCategory category = 7) {
    return worker.handleMessage(TWReportingSessionMessage(payload, category, type));
  }

  std::shared_ptr<TWReportingSession> session = makeSession();
  TWReportingSessionDiagwireWorker worker{session};
};

TEST_F(TWReportingSessionDiagwireWorkerTest, IsAConsumerFromTheSessionsCreationAlsoInSingleMessageSessions) {
  const auto& workerClass = TWReportingSessionDiagwireWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_TRUE(workerClass.startOnInit);
  EXPECT_TRUE(workerClass.handleSingleMessageSession);
  EXPECT_FALSE(worker.handleRedundantMessages());
}

TEST_F(TWReportingSessionDiagwireWorkerTest, PostsAnIssueUnderItsIdentifier) {
  EXPECT_FALSE(handle({{"issue_type", "silence"},
                       {"rtaid_client", "caller"},
                       {"node", "mixer"},
                       {"any_channel_silence_seconds", 3}}));
  EXPECT_THAT(test.diagwire.posts(), ElementsAre(Post{5963779, {"2=3", "3=silence", "4=mixer", "5=caller"}}));
  EXPECT_THAT(test.log.linesOf("twra"), IsEmpty());
}

TEST_F(TWReportingSessionDiagwireWorkerTest, AnIssueWithoutAnyKeyIsPostedEmptyAndEachMissingKeyIsLogged) {
  handle({});
  EXPECT_THAT(test.diagwire.posts(), ElementsAre(Post{0x5B0003, {"2=0", "3=", "4=", "5="}}));
  EXPECT_THAT(test.log.textsOf("twra", LogLevel::kError),
              ElementsAre("Failed to get issue_type for AudioIssueDetected",
                          "Failed to get rtaid_client for AudioIssueDetected",
                          "Failed to get node for AudioIssueDetected",
                          "Failed to get any_channel_silence_seconds for AudioIssueDetected"));
}

TEST_F(TWReportingSessionDiagwireWorkerTest, MessagesOfOtherTypesPostNothing) {
  for (int type = 0; type <= 20; ++type) {
    if (type != kIssueDetector) handle({{"issue_type", "silence"}}, static_cast<AudioEventType>(type));
  }
  handle({{"issue_type", "silence"}}, kTypeUnknown);
  EXPECT_THAT(test.diagwire.posts(), IsEmpty());
}

TEST_F(TWReportingSessionDiagwireWorkerTest, TheCategoryDoesNotMatter) {
  handle({{"node", "a"}}, kIssueDetector, 0);
  handle({{"node", "b"}}, kIssueDetector, 0x20000004);
  EXPECT_EQ(test.diagwire.posts().size(), 2U);
}

TEST_F(TWReportingSessionDiagwireWorkerTest, ANumericIssueTypeIsPostedAsItsText) {
  handle({{"issue_type", 12}, {"node", 2.5}, {"rtaid_client", true}});
  EXPECT_THAT(test.diagwire.posts(), ElementsAre(Post{0x5B0003, {"2=0", "3=12", "4=2.5", "5=1"}}));
}

TEST_F(TWReportingSessionDiagwireWorkerTest, ATextEndsAtItsFirstZeroByte) {
  handle({{"issue_type", std::string("ab\0cd", 5)}});
  EXPECT_EQ(test.diagwire.posts().at(0).fields.at(1), "3=ab");
}

TEST_F(TWReportingSessionDiagwireWorkerTest, TheDurationIsTheLow32Bits) {
  handle({{"any_channel_silence_seconds", (std::int64_t{1} << 32) + 1}});
  handle({{"any_channel_silence_seconds", -1}});
  handle({{"any_channel_silence_seconds", (std::uint64_t{1} << 63U) + 5}});
  handle({{"any_channel_silence_seconds", "12.7"}});
  std::vector<std::string> durations;
  for (const auto& post : test.diagwire.posts()) durations.push_back(post.fields.at(0));
  EXPECT_THAT(durations, ElementsAre("2=1", "2=4294967295", "2=5", "2=12"));
}

}  // namespace
}  // namespace tonewerk

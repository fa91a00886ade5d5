// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/DaemonWatch.h"

#include <gmock/gmock.h>
#include <optional>
#include <poll.h>

#include "support/TemporaryDirectory.h"
#include "tools/twctl/ScriptedDaemon.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr double kNow = 1000.0;

class DaemonWatchTest : public testing::Test {
 protected:
  // Lets it work until the condition holds. `time_` stands still, so that nothing becomes due in between.
  template <typename Condition>
  void proceedUntil(Condition condition) {
    for (;;) {
      watch_.proceed(time_, kNow);
      if (condition()) return;
      pollfd polled{watch_.fileDescriptor(), POLLIN, 0};
      ::poll(&polled, 1, -1);
    }
  }
  std::size_t sessions() const { return watch_.sessions().toValues().size(); }
  static ValueMap listing(std::int64_t total, std::int64_t reporter) {
    const ValueMap session{
        {"reporterID", reporter}, {"processIdentifier", 5}, {"started", true}, {"seconds", 10.0}};
    return {{"total", total}, {"sessions", ValueArray{session}}};
  }

  TemporaryDirectory directory_;
  const std::string path_ = directory_.path("reporting.sock");
  DaemonWatch::Time time_{std::chrono::hours(1)};
  DaemonWatch watch_{{path_}, [this] { return time_; }};
};

TEST_F(DaemonWatchTest, SaysThatNoDaemonAnswersAndTriesAgainLater) {
  EXPECT_FALSE(watch_.hasAsked());
  EXPECT_FALSE(watch_.answers());
  watch_.proceed(time_, kNow);
  EXPECT_EQ(watch_.problem(), "The daemon does not answer; trying again.");
  EXPECT_EQ(watch_.nextStep(), time_ + DaemonWatch::kRetryPause);
  ScriptedDaemon daemon(path_);
  daemon.answer("watch.sessions", listing(1, 7));
  watch_.proceed(time_, kNow);
  EXPECT_FALSE(watch_.answers());
  time_ += DaemonWatch::kRetryPause;
  proceedUntil([&] { return watch_.answers(); });
  EXPECT_EQ(sessions(), 1U);
  EXPECT_EQ(watch_.connections(), 1U);
}

TEST_F(DaemonWatchTest, TellsTheDaemonThatItOnlyReadsAndWatchesEverything) {
  ScriptedDaemon daemon(path_);
  daemon.answer("watch.sessions", listing(1, 7));
  proceedUntil([&] { return watch_.answers(); });
  EXPECT_EQ(daemon.requests()[0].method, "observe");
  const auto opened = daemon.requestsFor("watch.openMessages");
  ASSERT_THAT(opened, SizeIs(1));
  EXPECT_THAT(opened[0].arguments, ElementsAre(std::nullopt, std::nullopt, std::nullopt));
}

TEST_F(DaemonWatchTest, AsksForThePortionsThatAreLeft) {
  ScriptedDaemon daemon(path_);
  daemon.answer("watch.sessions", listing(3, 7));
  proceedUntil([&] { return watch_.answers(); });
  const auto requests = daemon.requestsFor("watch.sessions");
  ASSERT_THAT(requests, SizeIs(3));
  EXPECT_EQ(requests[2].arguments[0]->integer(), 2);
}

TEST_F(DaemonWatchTest, SaysWhatTheDaemonRefuses) {
  ScriptedDaemon daemon(path_);
  daemon.refuse("watch.sessions", messagingError(kNotPermitted, "not permitted: only for trusted users"));
  proceedUntil([&] { return watch_.hasAsked(); });
  EXPECT_THAT(watch_.problem(), HasSubstr("watch.sessions: not permitted: only for trusted users"));
  EXPECT_EQ(watch_.fileDescriptor(), -1);
  EXPECT_GT(watch_.nextStep(), time_ + DaemonWatch::kRetryPause);
}

TEST_F(DaemonWatchTest, KeepsWhatItKnowsWhenTheDaemonGoes) {
  std::optional<ScriptedDaemon> daemon(path_);
  daemon->answer("watch.sessions", listing(1, 7));
  proceedUntil([&] { return watch_.answers(); });
  daemon.reset();
  EXPECT_EQ(watch_.problem(), "");
  proceedUntil([&] { return !watch_.answers(); });
  EXPECT_EQ(watch_.problem(), "The daemon does not answer; trying again.");
  EXPECT_EQ(sessions(), 1U);
}

// The next daemon's session with this identifier has not said it.
TEST_F(DaemonWatchTest, ForgetsAtTheDaemonsEndWhatWaitedForItsSession) {
  std::optional<ScriptedDaemon> daemon(path_);
  const ValueMap message{
      {"reporterID", 7}, {"time", kNow}, {"payload", ValueMap{{"session_output_running", true}}}};
  daemon->answer("watch.nextMessages", ValueMap{{"missed", 1}, {"messages", ValueArray{message}}});
  daemon->answer("watch.sessions", listing(1, 1));
  proceedUntil([&] { return watch_.answers() && watch_.missed() > 0; });
  const std::int64_t missed = watch_.missed();
  proceedUntil([&] { return watch_.missed() > missed; });  // after the listing, so that it waits
  daemon.reset();
  proceedUntil([&] { return !watch_.answers(); });
  daemon.emplace(path_);
  daemon->answer("watch.sessions", listing(1, 7));
  time_ += DaemonWatch::kRetryPause;
  proceedUntil([&] { return watch_.answers(); });
  const ValueArray all = watch_.sessions().toValues();
  ASSERT_THAT(all, SizeIs(1));
  EXPECT_THAT(*all[0].asMap()->find("stretches")->asArray(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk

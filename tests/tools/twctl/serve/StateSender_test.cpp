// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/StateSender.h"

#include <gmock/gmock.h>
#include <optional>
#include <poll.h>

#include "support/TemporaryDirectory.h"
#include "tools/twctl/ScriptedDaemon.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

class StateSenderTest : public testing::Test {
 protected:
  void send() { sender_.send(watch_, reading_, time_, now_); }
  // The state that was published since the last call; empty without one.
  std::string published() {
    const auto state = feed_.newerThan(number_, std::chrono::milliseconds::zero());
    return state == nullptr ? "" : *state;
  }
  void pass(std::chrono::milliseconds duration) {
    time_ += duration;
    now_ += std::chrono::duration<double>(duration).count();
  }

  TemporaryDirectory directory_;
  const std::string path_ = directory_.path("reporting.sock");
  DaemonWatch watch_{{path_}};
  StoredReport::Reading reading_;
  StateSender::Time time_{std::chrono::hours(1)};
  double now_ = 1000.0;
  LiveFeed feed_;
  std::uint64_t number_ = 0;
  StateSender sender_{feed_, std::nullopt};
};

TEST_F(StateSenderTest, PublishesAChangeOnceAndWithItsTime) {
  send();
  EXPECT_THAT(published(), StartsWith("{\"changed\":1000.000000,"));
  pass(std::chrono::seconds(5));
  send();
  EXPECT_EQ(published(), "");
  reading_.number = 2;
  pass(std::chrono::seconds(5));
  send();
  EXPECT_THAT(published(), StartsWith("{\"changed\":1010.000000,"));
}

// A message that changes nothing shown would otherwise cost a comparison each time.
TEST_F(StateSenderTest, LooksAtMostOnceInItsPauseEvenIfNothingHasChanged) {
  send();
  EXPECT_NE(published(), "");
  EXPECT_EQ(sender_.heldBackUntil(), std::nullopt);
  pass(std::chrono::seconds(5));
  send();  // nothing has changed
  const StateSender::Time due = time_ + StateSender::kLeastPause;
  reading_.number = 2;
  pass(StateSender::kLeastPause / 2);
  send();
  EXPECT_EQ(published(), "");
  EXPECT_EQ(sender_.heldBackUntil(), due);
  pass(StateSender::kLeastPause / 2);
  send();
  EXPECT_NE(published(), "");
  EXPECT_EQ(sender_.heldBackUntil(), std::nullopt);
}

// A page that opens an hour after the daemon's end must not let stretches grow until then.
TEST_F(StateSenderTest, SaysSinceWhenTheDaemonDoesNotAnswer) {
  std::optional<ScriptedDaemon> daemon(path_);
  daemon->answer("watch.sessions", ValueMap{{"total", 0}});
  const auto proceedUntil = [&](bool answers) {
    while (watch_.proceed(time_, now_), !watch_.hasAsked() || watch_.answers() != answers) {
      pollfd polled{watch_.fileDescriptor(), POLLIN, 0};
      ::poll(&polled, 1, -1);
    }
  };
  proceedUntil(true);
  send();
  EXPECT_THAT(published(), HasSubstr("\"lost\":null"));
  daemon.reset();
  pass(std::chrono::seconds(5));
  proceedUntil(false);
  send();
  EXPECT_THAT(published(), HasSubstr("\"lost\":1005"));
  pass(std::chrono::seconds(5));
  reading_.number = 2;
  send();
  EXPECT_THAT(published(), HasSubstr("\"lost\":1005"));
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/store/ReportStore.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "tools/twctl/commands/Commands.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

// Runs twctl with a store that has two sessions with one message each.
class RtcCommandTest : public testing::Test {
 protected:
  RtcCommandTest() { setenv("STATE_DIRECTORY", directory_.path("state").c_str(), 1); }
  void TearDown() override { unsetenv("STATE_DIRECTORY"); }

  void fillStore() {
    ManualClock clock;
    MemoryLog log;
    const LogCategory category(log, "com.orvane.tonewerk", "twrs");
    const MemoryPreferenceStore preferences;
    Accounts accounts(990, clock);
    ReportStore store(directory_.path("state"), json_, preferences, clock, accounts, category);
    for (const char* name : {"telephony_session", "vocia"}) {
      auto session = std::make_shared<RtcSessionRecord>();
      session->startedAt = clock.now();
      session->sessionInfo = {{"kLinkReportSessionInfoSessionID", 77}};
      session->userInfo = {{"kLinkReportUserInfoServiceName", name}};
      store.record(RtcSessionRow{session});
      store.record(RtcMessageRow{clock.now() + 0.5, session, 4, 65535, {{"of", name}}});
      clock.advance(10.0);
    }
    ASSERT_TRUE(store.flush(std::chrono::seconds(30)));
  }
  int run(std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), "twctl");
    out_.str({});
    err_.str({});
    Tool tool{out_, err_, json_};
    return runCommandLine(static_cast<int>(arguments.size()), arguments.data(), tool);
  }
  std::string output() const { return out_.str(); }

  TemporaryDirectory directory_;
  NlohmannJsonService json_;
  std::ostringstream out_;
  std::ostringstream err_;
};

TEST_F(RtcCommandTest, SaysThatThereIsNoStore) {
  EXPECT_EQ(run({"rtc"}), kRefused);
  EXPECT_THAT(err_.str(), HasSubstr("there is no such file"));
}

TEST_F(RtcCommandTest, ShowsSessionsAndThenMessagesToPeople) {
  fillStore();
  EXPECT_EQ(run({"rtc"}), kDone);
  const std::size_t sessions = output().find("session_info");
  const std::size_t messages = output().find("category");
  EXPECT_LT(sessions, messages);
  EXPECT_NE(messages, std::string::npos);
  EXPECT_THAT(output(), HasSubstr("2025-11-20 10:18:00.500Z"));
  EXPECT_THAT(output(), HasSubstr(R"({"of":"vocia"})"));
}

TEST_F(RtcCommandTest, PrintsNothingThatControlsATerminal) {
  {
    ManualClock clock;
    MemoryLog log;
    const LogCategory category(log, "com.orvane.tonewerk", "twrs");
    const MemoryPreferenceStore preferences;
    Accounts accounts(990, clock);
    ReportStore store(directory_.path("state"), json_, preferences, clock, accounts, category);
    auto session = std::make_shared<RtcSessionRecord>();
    session->startedAt = clock.now();
    session->sessionInfo = {{"id\x7F", "a\x1b\n"}};
    session->userInfo = {{"kLinkReportUserInfoServiceName", "s\xC2\x9B"}};
    store.record(RtcSessionRow{session});
    store.record(RtcMessageRow{clock.now(), session, 4, 65535, {{"k\xE2\x80\xAE", "\xE2\x80\xA8"}}});
    ASSERT_TRUE(store.flush(std::chrono::seconds(30)));
  }
  for (const std::vector<const char*>& arguments : {std::vector{"rtc"}, std::vector{"rtc", "--json"}}) {
    EXPECT_EQ(run(arguments), kDone);
    EXPECT_THAT(output(), AllOf(HasSubstr(R"({"id\u007f":"a\u001b\n"})"), HasSubstr(R"("s\u009b")"),
                                HasSubstr(R"({"k\u202e":"\u2028"})")));
  }
}

TEST_F(RtcCommandTest, GivesBothToPrograms) {
  fillStore();
  EXPECT_EQ(run({"rtc", "--json", "--name", "telephony*"}), kDone);
  EXPECT_EQ(output(),
            R"({"id":1,"started_at":1763633880.0,"session_info":{"kLinkReportSessionInfoSessionID":77},)"
            R"("user_info":{"kLinkReportUserInfoServiceName":"telephony_session"}})"
            "\n"
            R"({"id":1,"sent_at":1763633880.5,"rtc_session":1,"category":4,"type":65535,)"
            R"("payload":{"of":"telephony_session"}})"
            "\n");
}

TEST_F(RtcCommandTest, TakesTimesAndNumbers) {
  fillStore();
  EXPECT_EQ(run({"rtc", "--json", "--limit", "1"}), kDone);
  EXPECT_THAT(output(), Not(HasSubstr("telephony")));
  EXPECT_EQ(run({"rtc", "--json", "--until", "2025-11-20T10:18:05Z"}), kDone);
  EXPECT_THAT(output(), Not(HasSubstr("vocia")));
  EXPECT_EQ(run({"rtc", "--json", "--since", "2025-11-20T10:19:00Z"}), kDone);
  EXPECT_THAT(output(), IsEmpty());
  EXPECT_EQ(run({"rtc", "--since", "then"}), kWrongUsage);
}

}  // namespace
}  // namespace tonewerk

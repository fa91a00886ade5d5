// SPDX-License-Identifier: Apache-2.0
//
// Tests what sessions are told of named notifications.
#include <chrono>
#include <cstddef>
#include <fstream>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using nlohmann::json;

constexpr AudioServiceType kLongFormAudio = 7;
constexpr std::size_t kSessions = 20;
constexpr std::chrono::milliseconds kInterval{100};

class NotificationsTest : public RunningDaemonTest {
 protected:
  // The ringer states that all sessions were told, oldest first.
  std::vector<bool> told() const {
    std::vector<bool> states;
    for (const json& event :
         RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.Setup.Setup")) {
      if (event.contains("ringerstate")) states.push_back(event["ringerstate"] == true);
    }
    return states;
  }

  const std::string ringer =
      daemon.path(DaemonProcess::kRuntime) + "/notifications/com.orvane.homedeck.ringerstate";
};

// Two hundred sessions had 311,727 rows of a file that was rewritten for five seconds.
TEST_F(NotificationsTest, AFileThatIsRewrittenAllTheTimeIsToldTenTimesASecondAndTheLastStateAlways) {
  DaemonClient client = connect();
  for (std::size_t session = 0; session < kSessions; ++session) {
    client.create(static_cast<ReporterID>(session + 1), kLongFormAudio);
    client.start(static_cast<ReporterID>(session + 1));
  }
  const auto begin = std::chrono::steady_clock::now();
  std::size_t posts = 0;
  for (; std::chrono::steady_clock::now() < begin + std::chrono::seconds(2); ++posts) {
    std::ofstream(ringer) << posts % 2 << '\n';
  }
  ASSERT_GT(posts, 100U);
  std::ofstream(ringer) << "1\n";
  const auto passed = std::chrono::steady_clock::now() - begin;
  const auto isLastStateTold = [&] {
    const std::vector<bool> states = told();
    if (states.size() < kSessions) return false;
    return std::vector<bool>(states.end() - kSessions, states.end()) == std::vector<bool>(kSessions, true);
  };
  EXPECT_TRUE(waitUntil(isLastStateTold)) << daemon.log();
  EXPECT_LE(told().size(), kSessions * static_cast<std::size_t>(passed / kInterval + 2));
}

}  // namespace
}  // namespace tonewerk

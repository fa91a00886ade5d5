// SPDX-License-Identifier: Apache-2.0
//
// Tests that no user can take what another one needs: connections, log lines.
#include <algorithm>
#include <string>
#include <sys/resource.h>

#include "system/support/UsersTest.h"

namespace tonewerk {
namespace {

using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;

// Limits the descriptors of processes that this one starts, as long as it exists.
class DescriptorLimit {
 public:
  explicit DescriptorLimit(rlim_t limit) {
    ::getrlimit(RLIMIT_NOFILE, &before_);
    const rlimit lower{limit, limit};
    EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &lower), 0);
  }
  DescriptorLimit(const DescriptorLimit&) = delete;
  DescriptorLimit& operator=(const DescriptorLimit&) = delete;
  ~DescriptorLimit() { ::setrlimit(RLIMIT_NOFILE, &before_); }

 private:
  rlimit before_{};
};

class SharesTest : public UsersTest {
 protected:
  std::size_t logLines() const {
    const std::string log = daemon.log();
    return static_cast<std::size_t>(std::count(log.begin(), log.end(), '\n'));
  }
};

TEST_F(SharesTest, AUserThatOpensAllConnectionsItCanLeavesOneForTheNext) {
  {
    const DescriptorLimit limit(200);
    ASSERT_TRUE(startDaemon());
  }
  UserProcess& greedy = start(kAlice, {"connections", "400"});
  const double taken = greedy.number("answered").value_or(0);
  EXPECT_GT(taken, 10);
  EXPECT_LT(taken, 200);
  DaemonClient bob = connectAs(kBob);
  bob.create(kSession, kLongFormAudio);
  EXPECT_EQ(bob.serviceType(kSession), kLongFormAudio);
  // Even one that comes after both of them.
  DaemonClient root = connect();
  EXPECT_THAT(root.allReporters(), SizeIs(1));
}

TEST_F(SharesTest, MessagesForSessionsThatDoNotExistHaveAFewLinesInTheLog) {
  daemon.setEnvironment("TONEWERK_LOG", "default");
  ASSERT_TRUE(startDaemon());
  const std::size_t before = logLines();
  constexpr std::size_t kRequests = 256;
  start(kAlice, {"unknown", std::to_string(kRequests), "4000"});
  EXPECT_LE(logLines(), before + kRequests);
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/PageServer.h"

#include <gmock/gmock.h>

#include "tools/twctl/serve/StateSender.h"

namespace tonewerk {
namespace {

constexpr std::uint16_t kPort = 8080;
constexpr const char* kToken = "secret";

class PageServerTest : public testing::Test {
 protected:
  PageAnswer ask(std::string_view path) const {
    PageRequest request;
    request.method = "GET";
    request.path = path;
    request.token = kToken;
    request.host = "127.0.0.1:8080";
    return pages_.answer(request);
  }

  double now_ = 1000.0;
  StoredReport stored_{
      {[](const std::stop_token&) { return StoredReport::Reading(); }, [] { return std::string(); }}};
  LiveFeed feed_;
  const RequestCheck check_{kPort, kToken};
  const PageServer pages_{check_, stored_, feed_, [this] { return now_; }};
};

// Its stretches would otherwise end where the last change was.
TEST_F(PageServerTest, TellsAPageThatOpensLateWhatTimeItIs) {
  feed_.publish("{\"changed\":1000.0}");
  now_ = 4600.0;
  const PageAnswer answer = ask("/live");
  EXPECT_EQ(answer.type, "text/event-stream");
  EXPECT_EQ(answer.parts(), "retry: 1000\n\n");
  EXPECT_EQ(answer.parts(), "data: {\"now\":4600.000000,\"changed\":1000.0}\n\n");
  feed_.end();
  EXPECT_EQ(answer.parts(), "");
}

}  // namespace
}  // namespace tonewerk

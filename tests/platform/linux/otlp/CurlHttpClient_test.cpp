// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/CurlHttpClient.h"

#include <gmock/gmock.h>
#include <thread>

#include "support/OtlpReceiver.h"

namespace tonewerk {
namespace {

using std::chrono::hours;
using std::chrono::milliseconds;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;
using Fault = OtlpReceiver::Fault;

// Longer than the tests' own timeout, so that a test fails if it waits for them.
constexpr CurlHttpClient::Timeouts kNever{hours(1), hours(1)};

class CurlHttpClientTest : public testing::Test {
 protected:
  HttpAnswer post(CurlHttpClient& client) {
    return client.post(
        {receiver_.address() + "/v1/logs", {"Content-Type: application/json"}, R"({"resourceLogs":[]})"});
  }
  HttpAnswer postAndGet(OtlpReceiver::Answer answer) {
    receiver_.answerNext(std::move(answer));
    return post(client_);
  }

  OtlpReceiver receiver_;
  CurlHttpClient client_{"tester/1", kNever};
};

TEST_F(CurlHttpClientTest, PostsAndGivesTheAnswer) {
  const HttpAnswer answer = postAndGet({.status = 202, .headers = {"retry-AFTER: 17"}, .body = "hello"});
  EXPECT_EQ(answer.status, 202);
  EXPECT_EQ(answer.body, "hello");
  EXPECT_THAT(answer.retryAfter, HasSubstr("17"));
  EXPECT_EQ(answer.problem, "");
  ASSERT_THAT(receiver_.requests(), SizeIs(1));
  EXPECT_EQ(receiver_.requests()[0].body, R"({"resourceLogs":[]})");
  EXPECT_EQ(receiver_.requests()[0].headers.at("user-agent"), "tester/1");
  EXPECT_THAT(receiver_.problems(), IsEmpty());
}

TEST_F(CurlHttpClientTest, SendsALargeBodyWithoutAskingFirst) {
  const std::string large = R"({"resourceLogs":[],"x":")" + std::string(5'000'000, 'x') + "\"}";
  const HttpAnswer answer =
      client_.post({receiver_.address() + "/v1/logs", {"Content-Type: application/json"}, large});
  EXPECT_EQ(answer.status, 200);
  EXPECT_EQ(receiver_.requests().at(0).body.size(), large.size());
}

TEST_F(CurlHttpClientTest, ForgetsThePreviousAnswer) {
  postAndGet({.status = 503, .headers = {"Retry-After: 17"}, .body = "busy"});
  const HttpAnswer answer = postAndGet({});
  EXPECT_EQ(answer.status, 200);
  EXPECT_EQ(answer.retryAfter, "");
  EXPECT_EQ(answer.body, "{}");
}

TEST_F(CurlHttpClientTest, NeverFollowsARedirection) {
  const HttpAnswer answer =
      postAndGet({.status = 307, .headers = {"Location: " + receiver_.address() + "/v1/logs"}});
  EXPECT_EQ(answer.status, 307);
  EXPECT_THAT(receiver_.requests(), SizeIs(1));
}

TEST_F(CurlHttpClientTest, ReadsABodyUpToItsLimit) {
  const HttpAnswer answer = postAndGet({.fault = Fault::kHugeBody});
  EXPECT_EQ(answer.status, 200);
  EXPECT_EQ(answer.body.size(), HttpAnswer::kMaxBodyBytes);
  EXPECT_THAT(answer.problem, Not(IsEmpty()));
}

TEST_F(CurlHttpClientTest, ReadsHeadersUpToTheirLimit) {
  const HttpAnswer answer = postAndGet({.fault = Fault::kHugeHeader});
  EXPECT_EQ(answer.body, "");
  EXPECT_THAT(answer.problem, Not(IsEmpty()));
}

TEST_F(CurlHttpClientTest, InvalidAndIncompleteAnswersAreNoAnswer) {
  for (const Fault fault : {Fault::kGarbage, Fault::kCloseEarly}) {
    const HttpAnswer answer = postAndGet({.fault = fault});
    EXPECT_EQ(answer.status, 0);
    EXPECT_THAT(answer.problem, Not(IsEmpty()));
  }
}

TEST_F(CurlHttpClientTest, SaysWhenTheBodyIsCut) {
  const HttpAnswer answer = postAndGet({.fault = Fault::kCutBody});
  EXPECT_EQ(answer.status, 200);
  EXPECT_EQ(answer.body, "{}");
  EXPECT_THAT(answer.problem, Not(IsEmpty()));
}

TEST_F(CurlHttpClientTest, AClosedPortGivesNoAnswer) {
  const HttpAnswer answer = client_.post({OtlpReceiver::deadAddress() + "/v1/logs", {}, ""});
  EXPECT_EQ(answer.status, 0);
  EXPECT_THAT(answer.problem, Not(IsEmpty()));
}

TEST_F(CurlHttpClientTest, GivesUpOnAnEndpointThatHangs) {
  CurlHttpClient impatient("tester/1", {hours(1), milliseconds(50)});
  receiver_.answerNext({.fault = Fault::kHang});
  const HttpAnswer answer = post(impatient);
  EXPECT_EQ(answer.status, 0);
  EXPECT_THAT(answer.problem, Not(IsEmpty()));
}

TEST_F(CurlHttpClientTest, ACancelledPostAndLaterOnesReturnAtOnce) {
  receiver_.answerNext({.fault = Fault::kHang});
  HttpAnswer answer;
  answer.status = -1;
  std::thread poster([&] { answer = post(client_); });
  EXPECT_TRUE(receiver_.waitForRequests(1));
  client_.cancel();
  poster.join();
  EXPECT_EQ(answer.status, 0);
  EXPECT_EQ(post(client_).status, 0);
  EXPECT_THAT(receiver_.requests(), SizeIs(1));
}

}  // namespace
}  // namespace tonewerk

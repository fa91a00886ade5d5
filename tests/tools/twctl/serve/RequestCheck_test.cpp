// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/RequestCheck.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::HasSubstr;

class RequestCheckTest : public testing::Test {
 protected:
  static PageRequest good() {
    PageRequest request;
    request.method = "GET";
    request.path = "/";
    request.token = "secret";
    request.host = "127.0.0.1:8080";
    return request;
  }
  // 200 for a request that may be answered.
  unsigned int statusOf(const PageRequest& request) const {
    const auto refusal = check_.problemWith(request);
    return refusal ? refusal->status : 200;
  }
  std::string sentenceFor(const PageRequest& request) const {
    const auto refusal = check_.problemWith(request);
    return refusal ? refusal->sentence : "";
  }

  const RequestCheck check_{8080, "secret"};
};

TEST_F(RequestCheckTest, LetsAReaderWithTheTokenIn) {
  PageRequest request = good();
  EXPECT_EQ(statusOf(request), 200U);
  request.method = "HEAD";
  request.host = "localhost:8080";
  request.hasOrigin = true;
  request.origin = "http://localhost:8080";
  EXPECT_EQ(statusOf(request), 200U);
}

TEST_F(RequestCheckTest, WantsTheTokenAndSaysWhereItIs) {
  PageRequest request = good();
  request.token.reset();
  EXPECT_EQ(statusOf(request), 403U);
  EXPECT_THAT(sentenceFor(request), HasSubstr("Open the whole address that twctl serve has printed"));
  for (const char* token : {"", "Secret", "secre", "secrets"}) {
    request.token = token;
    EXPECT_EQ(statusOf(request), 403U) << token;
  }
}

// A site can give its own name this machine's address, and its pages may then ask the server as their own.
TEST_F(RequestCheckTest, AnswersOnlyByItsOwnNames) {
  PageRequest request = good();
  for (const char* host : {"evil.example:8080", "127.0.0.1", "127.0.0.1:80", "127.0.0.1:80800", "localhost",
                           "[::1]:8080", "localhost:8080.evil.example", "127.0.0.1:8080 ", ""}) {
    request.host = host;
    EXPECT_EQ(statusOf(request), 403U) << host;
  }
  request.host.reset();
  EXPECT_EQ(statusOf(request), 403U);
  EXPECT_THAT(sentenceFor(request), HasSubstr("127.0.0.1:8080"));
}

TEST_F(RequestCheckTest, RefusesPagesOfOtherOrigins) {
  PageRequest request = good();
  request.hasOrigin = true;
  for (const char* origin : {"http://evil.example", "null", "https://127.0.0.1:8080", "http://127.0.0.1:8081",
                             "http://localhost:8080.evil.example", ""}) {
    request.origin = origin;
    EXPECT_EQ(statusOf(request), 403U) << origin;
  }
  request.origin.reset();  // several
  EXPECT_EQ(statusOf(request), 403U);
}

TEST_F(RequestCheckTest, OnlyReads) {
  PageRequest request = good();
  for (const char* method : {"POST", "PUT", "DELETE", "OPTIONS", "PATCH", "get", ""}) {
    request.method = method;
    EXPECT_EQ(statusOf(request), 405U) << method;
  }
  request = good();
  request.hasBody = true;
  EXPECT_EQ(statusOf(request), 400U);
}

}  // namespace
}  // namespace tonewerk

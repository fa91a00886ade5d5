// SPDX-License-Identifier: Apache-2.0
//
// Tests bytes that are not a frame of the protocol: they end their connection, and no other client notices.
#include <signal.h>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/socket/RawClient.h"
#include "system/support/DaemonTest.h"
#include "system/support/Packed.h"

namespace tonewerk {
namespace {

using packed::array;
using packed::arrayHeader;
using packed::binaryHeader;
using packed::boolean;
using packed::byte;
using packed::extensionHeader;
using packed::integer;
using packed::map;
using packed::mapHeader;
using packed::nil;
using packed::real;
using packed::request;
using packed::text;
using packed::textHeader;
using packed::unsignedInteger;

constexpr ReporterID kBystander = 77;

struct Bytes {
  const char* what;
  std::string bytes;
};

std::string frame(const std::vector<std::string>& elements) { return array(elements); }
std::string noParams() { return array({}); }

std::vector<Bytes> malformedFrames() {
  const std::string method = text("getAllReporters");
  return {
      {"a byte that MessagePack does not use", byte(0xC1)},
      {"an extension without a length", byte(0xC7) + byte(0) + byte(5)},
      {"text of another protocol", "GET / HTTP/1.1\r\nHost: localhost\r\n\r\n"},
      {"nil instead of a frame", nil()},
      {"a boolean instead of a frame", boolean(true)},
      {"a number instead of a frame", integer(7)},
      {"a double instead of a frame", real(0.5)},
      {"a text instead of a frame", method},
      {"a map instead of a frame", map({text("a"), integer(1)})},
      {"binary data instead of a frame", packed::binary("abc")},
      {"an extension instead of a frame", packed::extension(5, "abc")},
      {"an empty array", frame({})},
      {"an array of two", frame({integer(0), integer(1)})},
      {"an array of five", frame({integer(0), integer(1), method, noParams(), nil()})},
      {"a frame of kind 3", frame({integer(3), integer(1), method, noParams()})},
      {"a frame of kind -1", frame({integer(-1), integer(1), method, noParams()})},
      {"a frame whose kind is a double", frame({real(0), integer(1), method, noParams()})},
      {"a frame whose kind is a text", frame({text("0"), integer(1), method, noParams()})},
      {"a frame whose kind is nil", frame({nil(), integer(1), method, noParams()})},
      {"a request as long as a notification", frame({integer(0), method, noParams()})},
      {"a notification as long as a request", frame({integer(2), integer(1), method, noParams()})},
      {"an identifier below its range", frame({integer(0), integer(-1), method, noParams()})},
      {"an identifier above its range",
       frame({integer(0), integer(std::int64_t{1} << 32U), method, noParams()})},
      {"the largest identifier there is",
       frame({integer(0), unsignedInteger(UINT64_MAX), method, noParams()})},
      {"an identifier that is a double", frame({integer(0), real(1), method, noParams()})},
      {"an identifier that is nil", frame({integer(0), nil(), method, noParams()})},
      {"an identifier that is a text", frame({integer(0), text("1"), method, noParams()})},
      {"an identifier that is an array", frame({integer(0), array({}), method, noParams()})},
      {"a method that is a number", frame({integer(0), integer(1), integer(3), noParams()})},
      {"a method that is nil", frame({integer(0), integer(1), nil(), noParams()})},
      {"a method that is binary", frame({integer(0), integer(1), packed::binary("kill"), noParams()})},
      {"a method that is not UTF-8", frame({integer(0), integer(1), text("get\xC3\x28"), noParams()})},
      {"a method cut in a character", frame({integer(0), integer(1), text("get\xE2\x82"), noParams()})},
      {"a method that is a surrogate", frame({integer(0), integer(1), text("\xED\xA0\x80"), noParams()})},
      {"a notification's method that is not UTF-8", frame({integer(2), text("\xFF"), noParams()})},
      {"params that are nil", frame({integer(0), integer(1), method, nil()})},
      {"params that are a map", frame({integer(0), integer(1), method, map({})})},
      {"params that are a number", frame({integer(0), integer(1), method, integer(1)})},
      {"params that are a text", frame({integer(0), integer(1), method, text("")})},
      {"params that are binary", frame({integer(0), integer(1), method, packed::binary("")})},
      {"params that are a date", frame({integer(0), integer(1), method, packed::extension(-1, "abcd")})},
      {"a response", frame({integer(1), integer(1), nil(), nil()})},
      {"a response with an error", frame({integer(1), integer(1), map({text("code"), integer(1)}), nil()})},
      {"garbage behind a good frame", request(1, "getAllReporters", {}) + byte(0xC1)},
      {"a response behind a good frame",
       request(1, "getAllReporters", {}) + frame({integer(1), integer(1), nil(), nil()})},
  };
}

// Frames whose headers announce more data than follows.
std::vector<Bytes> emptyClaims() {
  constexpr std::uint32_t kMax = 0xFFFFFFFF;
  const std::string start = arrayHeader(4) + integer(0) + integer(1);
  const std::string inParams = start + text("sendMessage") + arrayHeader(4);
  return {
      {"4 Gi params", start + text("sendMessage") + arrayHeader(kMax)},
      {"a list of 4 Gi", inParams + mapHeader(1) + text("a") + arrayHeader(kMax)},
      {"a map of 4 Gi", inParams + mapHeader(kMax)},
      {"a text of 4 GiB", inParams + mapHeader(1) + text("a") + textHeader(kMax)},
      {"a key of 4 GiB", inParams + mapHeader(1) + textHeader(kMax)},
      {"a method of 4 GiB", start + textHeader(kMax)},
      {"binary data of 4 GiB", inParams + binaryHeader(kMax)},
      {"an extension of 4 GiB - 1", inParams + extensionHeader(kMax - 1, 5)},
  };
}

// A valid message request of exactly this many bytes.
std::string messageOfSize(std::size_t bytes) {
  const auto withText = [](std::size_t length) {
    return request(9, "sendMessage",
                   {map({text("long"), text(std::string(length, 'x'))}), integer(1), integer(0),
                    array({integer(kBystander)})});
  };
  return withText(bytes - withText(0).size());
}

// A valid message request in which arrays and maps are nested this deep, the frame's own array included.
std::string messageOfDepth(std::size_t depth) {
  constexpr std::size_t kFrameParamsAndMessage = 3;
  std::string value;
  for (std::size_t at = kFrameParamsAndMessage + 1; at < depth; ++at) value += arrayHeader(1);
  value += arrayHeader(0);
  return request(9, "sendMessage", {map({text("deep"), value}), integer(1), integer(0), nil()});
}

class MalformedFramesTest : public RunningDaemonTest {
 protected:
  void SetUp() override {
    RunningDaemonTest::SetUp();
    if (HasFatalFailure()) return;
    bystander = std::make_unique<DaemonClient>(connect());
    bystander->create(kBystander, 7);
    bystander->start(kBystander);
  }
  void TearDown() override {
    expectNobodyElseNoticed();
    RunningDaemonTest::TearDown();
  }

  void expectNobodyElseNoticed() {
    EXPECT_EQ(bystander->allReporters(), std::vector{kBystander});
    EXPECT_EQ(bystander->serviceType(kBystander), 7);
    EXPECT_TRUE(bystander->answered().empty()) << "its session has been stopped";
  }

  void expectToEndItsConnection(const std::string& bytes) {
    const std::size_t before = errorLines();
    RawClient client(daemon.socketPath());
    ASSERT_TRUE(client.isConnected());
    client.send(bytes);  // fails when the daemon ends the connection before the last byte
    EXPECT_TRUE(client.waitForEnd());
    ASSERT_TRUE(waitUntil([&] { return errorLines() == before + 1; })) << daemon.log();
  }

  std::size_t errorLines() const { return logLinesWith(" and is ended", " error twrs "); }

  std::unique_ptr<DaemonClient> bystander;
};

TEST_F(MalformedFramesTest, EachEndsItsOwnConnectionAlone) {
  for (const auto& [what, bytes] : malformedFrames()) {
    SCOPED_TRACE(what);
    expectToEndItsConnection(bytes);
    expectNobodyElseNoticed();
  }
}

TEST_F(MalformedFramesTest, EachEndsItsConnectionAlsoWhenItComesByteByByte) {
  for (const auto& [what, bytes] : malformedFrames()) {
    SCOPED_TRACE(what);
    RawClient client(daemon.socketPath());
    for (const char single : bytes) {
      if (!client.send({&single, 1})) break;
    }
    EXPECT_TRUE(client.waitForEnd());
  }
}

TEST_F(MalformedFramesTest, WhatCameBeforeABadFrameIsStillCarriedOut) {
  RawClient client(daemon.socketPath());
  client.send(request(1, "createReportingSession", {integer(5)}) +
              packed::notification("setServiceType", {integer(3), integer(5)}) + byte(0xC1));
  EXPECT_TRUE(client.waitForEnd());
  // The session is destroyed with its connection, after both requests have run.
  EXPECT_TRUE(waitUntil([&] { return bystander->allReporters() == std::vector{kBystander}; }));
}

TEST_F(MalformedFramesTest, AFrameOfOneMebibyteIsTakenAndALongerOneEndsTheConnection) {
  for (const std::size_t bytes : {kMaxFrameBytes - 1, kMaxFrameBytes}) {
    RawClient client(daemon.socketPath());
    ASSERT_TRUE(client.send(messageOfSize(bytes)));
    const auto answer = client.response();
    ASSERT_TRUE(answer) << bytes;
    EXPECT_FALSE(answer->error) << answer->error->text();
  }
  expectToEndItsConnection(messageOfSize(kMaxFrameBytes + 1));
  expectToEndItsConnection(messageOfSize(2 * kMaxFrameBytes));
}

TEST_F(MalformedFramesTest, ThirtyTwoLevelsAreTakenAndThirtyThreeEndTheConnection) {
  for (const std::size_t depth : {kMaxFrameDepth - 1, kMaxFrameDepth}) {
    RawClient client(daemon.socketPath());
    ASSERT_TRUE(client.send(messageOfDepth(depth)));
    const auto answer = client.response();
    ASSERT_TRUE(answer) << depth;
    EXPECT_FALSE(answer->error) << answer->error->text();
  }
  expectToEndItsConnection(messageOfDepth(kMaxFrameDepth + 1));
  expectToEndItsConnection(messageOfDepth(100'000));
}

TEST_F(MalformedFramesTest, ClaimsOfGigabytesCostNothingWhileTheBytesDoNotCome) {
  constexpr std::size_t kEach = 8;
  const std::size_t before = daemon.residentBytes();
  std::vector<std::unique_ptr<RawClient>> clients;
  for (const auto& [what, bytes] : emptyClaims()) {
    for (std::size_t at = 0; at < kEach; ++at) {
      clients.push_back(std::make_unique<RawClient>(daemon.socketPath()));
      ASSERT_TRUE(clients.back()->send(bytes)) << what;
    }
  }
  expectNobodyElseNoticed();
  // Under a sanitizer each of the 64 connections may need half a mebibyte.
  EXPECT_LT(daemon.residentBytes(), before + clients.size() * 512 * 1024);
  for (const auto& client : clients) {
    client->shutDown(SHUT_WR);
    EXPECT_TRUE(client->waitForEnd());
  }
}

TEST_F(MalformedFramesTest, AFrameThatIsCutOffAnywhereIsForgottenWithItsConnection) {
  const std::string whole = messageOfDepth(8);
  for (std::size_t length = 0; length < whole.size(); ++length) {
    RawClient client(daemon.socketPath());
    ASSERT_TRUE(client.send(std::string_view(whole).substr(0, length)));
    client.shutDown(SHUT_WR);
    EXPECT_TRUE(client.waitForEnd()) << length;
  }
  EXPECT_EQ(errorLines(), 0);
}

TEST_F(MalformedFramesTest, AClientKilledInAFrameLeavesItsSessionsToBeStopped) {
  auto client = std::make_unique<RawClient>(daemon.socketPath());
  ASSERT_TRUE(client->send(request(1, "createReportingSession", {integer(5)})));
  ASSERT_TRUE(client->response());
  const pid_t child = fork();
  if (child == 0) {
    for (;;) pause();
  }
  ASSERT_GT(child, 0);
  const std::string whole = messageOfSize(kMaxFrameBytes);
  client->send(std::string_view(whole).substr(0, whole.size() / 2));
  client = nullptr;  // now only the child holds the connection
  EXPECT_THAT(bystander->allReporters(), ::testing::SizeIs(2));
  ::kill(child, SIGKILL);
  EXPECT_TRUE(waitUntil([&] { return bystander->allReporters() == std::vector{kBystander}; }));
  EXPECT_EQ(waitpid(child, nullptr, 0), child);
}

TEST_F(MalformedFramesTest, AClientThatOnlyEndsItsSendingSideIsAnsweredFirst) {
  RawClient client(daemon.socketPath());
  ASSERT_TRUE(client.send(request(41, "getServiceNameForReporterID", {integer(kBystander)})));
  const auto answer = client.response();
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->identifier, 41U);
  EXPECT_EQ(answer->result, Value(7));
  client.shutDown(SHUT_WR);
  EXPECT_TRUE(client.waitForEnd());
}

}  // namespace
}  // namespace tonewerk

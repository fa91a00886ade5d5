// SPDX-License-Identifier: Apache-2.0
//
// Tests well-formed requests with unsuitable arguments. They are refused with a text that names the argument,
// change nothing, and do not end the connection.
#include <map>
#include <string>
#include <vector>

#include "platform/linux/socket/RawClient.h"
#include "protocol/Requests.h"
#include "system/support/DaemonTest.h"
#include "system/support/Packed.h"

namespace tonewerk {
namespace {

using packed::array;
using packed::integer;
using packed::map;
using packed::text;
using ::testing::HasSubstr;

constexpr ReporterID kSession = 77;

struct PackedArgument {
  const char* what;
  std::string bytes;
};

std::vector<PackedArgument> neverRight() {
  return {
      {"a boolean", packed::boolean(true)},
      {"a double that is a whole number", packed::real(1.0)},
      {"NaN", packed::real(__builtin_nan(""))},
      {"a text", text("1")},
      {"an empty text", text("")},
      {"a text that is not UTF-8", text("\xC0\x80")},
      {"a text with a noncharacter", text("\xEF\xBF\xBF")},
      {"binary data", packed::binary("1")},
      {"an extension", packed::extension(5, "1234")},
      {"a date", packed::extension(-1, std::string(4, '\0'))},
      {"a date of no known length", packed::extension(-1, "123")},
      {"a date with too many nanoseconds", packed::extension(-1, std::string(8, '\xFF'))},
  };
}

std::vector<PackedArgument> wrongMaps() {
  return {
      {"a map with nil in it", map({text("a"), packed::nil()})},
      {"a map with binary data in it", map({text("a"), packed::binary("x")})},
      {"a map with an extension in it", map({text("a"), packed::extension(5, "x")})},
      {"a map with a text that is not UTF-8", map({text("a"), text("\xFF")})},
      {"a map with a key that is not UTF-8", map({text("\xFF"), integer(1)})},
      {"a map with a noncharacter in a text", map({text("a"), text("\xF4\x8F\xBF\xBF")})},
      {"a map with a noncharacter in a key", map({text("\xEF\xB7\xAF"), integer(1)})},
      {"a map with a number for a key", map({integer(1), integer(1)})},
      {"a map with nil for a key", map({packed::nil(), integer(1)})},
      {"a map with a map for a key", map({map({}), integer(1)})},
      {"nil deep in a map", map({text("a"), array({map({text("b"), array({packed::nil()})})})})},
  };
}

std::vector<PackedArgument> wrongLists() {
  return {
      {"a list with a text in it", array({integer(1), text("2")})},
      {"a list with a double in it", array({packed::real(2)})},
      {"a list with a boolean in it", array({packed::boolean(true)})},
      {"a list with nil in it", array({integer(1), packed::nil()})},
      {"a list in a list", array({array({integer(1)})})},
      {"a list with one above the range", array({packed::unsignedInteger(std::uint64_t{1} << 63U)})},
  };
}

const PackedArgument kNil{"nil", packed::nil()};
const PackedArgument kMap{"a map", map({text("a"), integer(1)})};
const PackedArgument kList{"a list", array({integer(1)})};
const PackedArgument kInteger{"an integer", integer(1)};

std::vector<PackedArgument> joined(std::vector<PackedArgument> all, const std::vector<PackedArgument>& more) {
  all.insert(all.end(), more.begin(), more.end());
  return all;
}

std::vector<PackedArgument> wrongFor(ParameterType type) {
  const std::vector<PackedArgument> always = joined(neverRight(), wrongMaps());
  const std::vector<PackedArgument> noInteger = joined(joined(always, wrongLists()), {kNil, kMap, kList});
  switch (type) {
    case ParameterType::kInt64:
      return joined(noInteger,
                    {{"one above 64 bits with a sign", packed::unsignedInteger(std::uint64_t{1} << 63U)},
                     {"the largest number there is", packed::unsignedInteger(UINT64_MAX)}});
    case ParameterType::kUInt32:
      return joined(noInteger, {{"-1", integer(-1)}, {"one above 32 bits", integer(std::int64_t{1} << 32U)}});
    case ParameterType::kUInt16:
      return joined(noInteger, {{"-1", integer(-1)}, {"one above 16 bits", integer(65'536)}});
    case ParameterType::kMap:
      return joined(joined(always, wrongLists()), {kNil, kList, kInteger});
    case ParameterType::kInt64ListOrNone:
      return joined(joined(always, wrongLists()), {kMap, kInteger});
  }
  return {};
}

std::string rightFor(ParameterType type) {
  switch (type) {
    case ParameterType::kMap:
      return map({text("a"), integer(1)});
    case ParameterType::kInt64ListOrNone:
      return array({integer(kSession)});
    default:
      return integer(kSession);
  }
}

std::vector<std::string> rightFor(const Method& method) {
  std::vector<std::string> params;
  for (const Parameter& parameter : method.parameters) params.push_back(rightFor(parameter.type));
  return params;
}

class WrongArgumentsTest : public RunningDaemonTest {
 protected:
  void SetUp() override {
    RunningDaemonTest::SetUp();
    if (HasFatalFailure()) return;
    bystander = std::make_unique<DaemonClient>(connect());
    bystander->create(kSession, 7);
    raw = std::make_unique<RawClient>(daemon.socketPath());
  }
  void TearDown() override {
    expectNothingChanged();
    EXPECT_EQ(logLinesWith(" and is ended"), 0U) << daemon.log();
    RunningDaemonTest::TearDown();
  }

  void expectNothingChanged() {
    EXPECT_EQ(bystander->allReporters(), std::vector{kSession});
    EXPECT_EQ(bystander->serviceType(kSession), 7);
  }

  // Sends the request, then a correct one. Both must be answered, in this order.
  void expectRefused(std::string_view method, const std::vector<std::string>& params, std::int64_t code,
                     const std::string& named) {
    const std::uint32_t identifier = nextIdentifier;
    nextIdentifier += 2;
    ASSERT_TRUE(raw->send(packed::request(identifier, method, params) +
                          packed::request(identifier + 1, "getAllReporters", {})));
    const auto refusal = raw->response();
    ASSERT_TRUE(refusal);
    EXPECT_EQ(refusal->identifier, identifier);
    EXPECT_FALSE(refusal->result);
    ASSERT_TRUE(refusal->error && refusal->error->asMap() != nullptr);
    const ValueMap& error = *refusal->error->asMap();
    EXPECT_EQ(error.text("domain"), "com.orvane.tonewerk.messaging");
    EXPECT_EQ(error.integer("code"), code);
    EXPECT_THAT(error.text("message"), HasSubstr(named));
    const auto answer = raw->response();
    ASSERT_TRUE(answer);
    EXPECT_EQ(answer->identifier, identifier + 1);
    EXPECT_EQ(answer->result, Value(ValueArray({Value(kSession)})));
    expectNothingChanged();
  }

  std::unique_ptr<DaemonClient> bystander;
  std::unique_ptr<RawClient> raw;
  std::uint32_t nextIdentifier = 1;
};

TEST_F(WrongArgumentsTest, EveryWrongKindForEveryParameterIsRefusedByItsName) {
  std::size_t refused = 0;
  for (const Method& method : requests::all().methods) {
    for (std::size_t at = 0; at < method.parameters.size(); ++at) {
      for (const auto& [what, bytes] : wrongFor(method.parameters[at].type)) {
        SCOPED_TRACE(std::string(method.name) + ", " + std::string(method.parameters[at].name) + ": " + what);
        std::vector<std::string> params = rightFor(method);
        params[at] = bytes;
        expectRefused(method.name, params, 2, "(" + std::string(method.parameters[at].name) + ")");
        if (HasFatalFailure()) return;
        ++refused;
      }
    }
  }
  EXPECT_GT(refused, 400U);
}

TEST_F(WrongArgumentsTest, TooFewAndTooManyArgumentsAreRefused) {
  for (const Method& method : requests::all().methods) {
    const std::vector<std::string> right = rightFor(method);
    for (const std::size_t count : {std::size_t{0}, right.size() - 1, right.size() + 1, std::size_t{40}}) {
      if (count == right.size() || count > 40) continue;
      SCOPED_TRACE(std::string(method.name) + " with " + std::to_string(count));
      std::vector<std::string> params = right;
      params.resize(count, integer(1));
      expectRefused(method.name, params, 2, std::string(method.name));
      if (HasFatalFailure()) return;
    }
  }
}

TEST_F(WrongArgumentsTest, AVastNumberOfArgumentsIsRefusedAtTheCostOfAFew) {
  const std::string params(900'000, static_cast<char>(0xC0));  // nils of one byte each
  ASSERT_TRUE(raw->send(packed::arrayHeader(4) + integer(0) + integer(1) + text("getAllReporters") +
                        packed::arrayHeader(static_cast<std::uint32_t>(params.size())) + params));
  const auto answer = raw->response();
  ASSERT_TRUE(answer);
  ASSERT_TRUE(answer->error && answer->error->asMap() != nullptr);
  EXPECT_EQ(answer->error->asMap()->integer("code"), 2);
}

TEST_F(WrongArgumentsTest, AnUnknownMethodIsRefusedByItsName) {
  for (const std::string method : {"", "nothing", "createreportingsession", "killService ", "killservice"}) {
    expectRefused(method, {integer(1)}, 1, "unknown method " + method);
  }
  const std::string longName(10'000, 'm');
  expectRefused(longName, {}, 1, "unknown method " + longName.substr(0, 32));
  // Refused because of its name, whatever its arguments are.
  expectRefused("nothing", {packed::nil(), packed::binary("x")}, 1, "unknown method nothing");
}

TEST_F(WrongArgumentsTest, WrongNotificationsAreNeitherAnsweredNorCarriedOut) {
  ASSERT_TRUE(raw->send(packed::notification("createReportingSession", {text("5")}) +
                        packed::notification("createReportingSession", {}) +
                        packed::notification("createReportingSession", {integer(5), integer(6)}) +
                        packed::notification("nothing", {}) + packed::request(9, "getAllReporters", {})));
  const auto answer = raw->response();
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->identifier, 9U);
  EXPECT_EQ(answer->result, Value(ValueArray({Value(kSession)})));
}

TEST_F(WrongArgumentsTest, TheEndsOfEveryRangeAreTaken) {
  DaemonClient client = connect();
  for (const ReporterID reporterID : {INT64_MIN, std::int64_t{-1}, INT64_MAX}) {
    client.create(reporterID, 65'535);
    client.send({}, 0xFFFFFFFF, 65'535, {reporterID});
    client.send({}, 0, 0, {reporterID});
    EXPECT_EQ(client.serviceType(reporterID), 65'535);
    client.destroy(reporterID);
  }
}

}  // namespace
}  // namespace tonewerk

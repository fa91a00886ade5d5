// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpLogRecord.h"

#include <gmock/gmock.h>
#include <limits>
#include <map>
#include <nlohmann/json.hpp>

#include "support/OtlpSchema.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

class OtlpLogRecordTest : public testing::Test {
 protected:
  OtlpLogRecordTest() {
    record_.time = 1'763'633'880.5;
    record_.identifier = "01ARYZ6S410000000000000000";
    record_.eventName = "telephony_session";
    record_.sessionIdentifier = -77;
    record_.category = 4;
    record_.type = 65535;
  }

  json encoded() const { return json::parse(otlpJsonOf(record_)); }
  std::map<std::string, json> attributes() const {
    std::map<std::string, json> found;
    const json list = encoded()["attributes"];
    for (const json& attribute : list) found[attribute["key"]] = attribute["value"];
    return found;
  }
  std::string request(const OtlpResource& resource) const {
    const std::vector<std::string> records{otlpJsonOf(record_), otlpJsonOf(record_)};
    return otlpRequestOf(resource, records);
  }

  OtlpLogRecord record_;
};

TEST_F(OtlpLogRecordTest, HoldsTimeAndEventName) {
  const json found = encoded();
  EXPECT_EQ(found["timeUnixNano"], "1763633880500000000");
  EXPECT_EQ(found["observedTimeUnixNano"], "1763633880500000000");
  EXPECT_EQ(found["severityNumber"], 9);
  EXPECT_EQ(found["eventName"], "telephony_session");
  EXPECT_FALSE(found.contains("body"));
  EXPECT_FALSE(found.contains("droppedAttributesCount"));
}

TEST_F(OtlpLogRecordTest, HoldsSessionCategoryAndType) {
  const auto found = attributes();
  EXPECT_EQ(found.at("session.id"), (json{{"stringValue", "-77"}}));
  EXPECT_EQ(found.at("tonewerk.category"), (json{{"intValue", "4"}}));
  EXPECT_EQ(found.at("tonewerk.type"), (json{{"intValue", "65535"}}));
  EXPECT_EQ(found.at("log.record.uid"), (json{{"stringValue", "01ARYZ6S410000000000000000"}}));
  EXPECT_EQ(found.count("event.name"), 0U);
}

TEST_F(OtlpLogRecordTest, KeepsTheTypesOfThePayload) {
  record_.payload = {{"yes", true},
                     {"least", std::numeric_limits<std::int64_t>::min()},
                     {"small", std::uint64_t{7}},
                     {"beyond", std::numeric_limits<std::uint64_t>::max()},
                     {"half", 0.5},
                     {"whole", 2.0},
                     {"text", "a \"quoted\"\n\x01 text"},
                     {"date", Date{0.5}},
                     {"list", ValueArray{1, "two", ValueArray{}}},
                     {"map", ValueMap{{"", 1}, {"inner", ValueMap{}}}}};
  const auto found = attributes();
  EXPECT_EQ(found.at("yes"), (json{{"boolValue", true}}));
  EXPECT_EQ(found.at("least"), (json{{"intValue", "-9223372036854775808"}}));
  EXPECT_EQ(found.at("small"), (json{{"intValue", "7"}}));
  EXPECT_EQ(found.at("beyond"), (json{{"stringValue", "18446744073709551615"}}));
  EXPECT_EQ(found.at("half"), (json{{"doubleValue", 0.5}}));
  EXPECT_EQ(found.at("whole"), (json{{"doubleValue", 2.0}}));
  EXPECT_EQ(found.at("text"), (json{{"stringValue", "a \"quoted\"\n\x01 text"}}));
  EXPECT_EQ(found.at("date"), (json{{"stringValue", "1970-01-01T00:00:00.5Z"}}));
  EXPECT_EQ(found.at("list"), json::parse(R"({"arrayValue":{"values":[{"intValue":"1"},{"stringValue":"two"},
                            {"arrayValue":{"values":[]}}]}})"));
  EXPECT_EQ(found.at("map"), json::parse(R"({"kvlistValue":{"values":[{"key":"","value":{"intValue":"1"}},
                            {"key":"inner","value":{"kvlistValue":{"values":[]}}}]}})"));
  EXPECT_THAT(problemsOfOtlpLogs(request({"n", "v", "h", "d"})), IsEmpty());
}

TEST_F(OtlpLogRecordTest, WritesNumbersThatJsonLacksAsTexts) {
  record_.payload = {{"nan", std::numeric_limits<double>::quiet_NaN()},
                     {"up", std::numeric_limits<double>::infinity()},
                     {"down", -std::numeric_limits<double>::infinity()}};
  const auto found = attributes();
  EXPECT_EQ(found.at("nan"), (json{{"doubleValue", "NaN"}}));
  EXPECT_EQ(found.at("up"), (json{{"doubleValue", "Infinity"}}));
  EXPECT_EQ(found.at("down"), (json{{"doubleValue", "-Infinity"}}));
  EXPECT_THAT(problemsOfOtlpLogs(request({"n", "v", "h", "d"})), IsEmpty());
}

TEST_F(OtlpLogRecordTest, APayloadCannotReplaceReservedAttributes) {
  record_.payload = {
      {"session.id", 1}, {"tonewerk.type", 2}, {"log.record.uid", 3}, {"event.name", 4}, {"", 5}, {"a", 6}};
  EXPECT_EQ(attributes().at("session.id"), (json{{"stringValue", "-77"}}));
  EXPECT_EQ(attributes().at("a"), (json{{"intValue", "6"}}));
  EXPECT_EQ(encoded()["droppedAttributesCount"], 5);
  EXPECT_THAT(problemsOfOtlpLogs(request({"n", "v", "h", "d"})), IsEmpty());
}

TEST_F(OtlpLogRecordTest, RepeatsTheEventsNameForOldReceiversWhenAsked) {
  record_.repeatsEventName = true;
  EXPECT_EQ(attributes().at("event.name"), (json{{"stringValue", "telephony_session"}}));
}

TEST_F(OtlpLogRecordTest, InvalidTimesAreEncoded) {
  for (const double time : {-1.0, 1e300, std::numeric_limits<double>::quiet_NaN()}) {
    record_.time = time;
    EXPECT_TRUE(encoded()["timeUnixNano"].is_string());
  }
}

TEST_F(OtlpLogRecordTest, ARequestNamesItsSender) {
  const std::string text = request({"com.orvane.tonewerk", "1.2.3", "abcdef", ""});
  EXPECT_THAT(problemsOfOtlpLogs(text), IsEmpty());
  const json resourceLogs = json::parse(text)["resourceLogs"];
  ASSERT_EQ(resourceLogs.size(), 1U);
  EXPECT_EQ(resourceLogs[0]["resource"]["attributes"],
            json::parse(R"([{"key":"service.name","value":{"stringValue":"com.orvane.tonewerk"}},
                            {"key":"service.version","value":{"stringValue":"1.2.3"}},
                            {"key":"host.id","value":{"stringValue":"abcdef"}}])"));
  const json scopeLogs = resourceLogs[0]["scopeLogs"];
  ASSERT_EQ(scopeLogs.size(), 1U);
  EXPECT_EQ(scopeLogs[0]["scope"]["version"], "1.2.3");
  EXPECT_EQ(scopeLogs[0]["logRecords"].size(), 2U);
}

TEST_F(OtlpLogRecordTest, ADeviceIsNamedAfterTheUserOptedIn) {
  EXPECT_THAT(request({"n", "v", "h", "speaker-7"}), HasSubstr("\"device.id\""));
  EXPECT_THAT(request({"n", "v", "h", ""}), Not(HasSubstr("device.id")));
}

TEST(OtlpSchemaTest, FindsWhatIsWrong) {
  const auto problems = [](const std::string& record) {
    return problemsOfOtlpLogs(R"({"resourceLogs":[{"scopeLogs":[{"logRecords":[)" + record + "]}]}]}");
  };
  const std::string times = R"("timeUnixNano":"1","observedTimeUnixNano":"1")";
  EXPECT_THAT(problems("{" + times + "}"), IsEmpty());
  EXPECT_THAT(problems(R"({"timeUnixNano":1,"observedTimeUnixNano":"0"})"),
              ElementsAre(HasSubstr("is not set"), HasSubstr("no 64-bit integer as text")));
  EXPECT_THAT(problems("{" + times + R"(,"event_name":"x"})"), ElementsAre(HasSubstr("unknown key")));
  EXPECT_THAT(problems("{" + times + R"(,"severityNumber":"INFO"})"), ElementsAre(HasSubstr("severity")));
  EXPECT_THAT(problems("{" + times + R"(,"attributes":[{"key":"a","value":{"intValue":1}}]})"),
              ElementsAre(HasSubstr("no 64-bit integer as text")));
  EXPECT_THAT(
      problems("{" + times + R"(,"attributes":[{"key":"","value":{"intValue":"1","boolValue":true}}]})"),
      ElementsAre(HasSubstr("is no key"), HasSubstr("of 2 kinds")));
  EXPECT_THAT(problems("{" + times + R"(,"attributes":[{"key":"a","value":{"intValue":"1"}},)" +
                       R"({"key":"a","value":{"intValue":"1"}}]})"),
              ElementsAre(HasSubstr("\"a\" twice")));
  EXPECT_THAT(problems("{" + times + R"(,"eventName":"a","eventName":"b"})"),
              ElementsAre(HasSubstr("\"eventName\" is there twice")));
  EXPECT_THAT(problemsOfOtlpLogs("{"), ElementsAre("no JSON"));
}

}  // namespace
}  // namespace tonewerk

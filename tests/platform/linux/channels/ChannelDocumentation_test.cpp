// SPDX-License-Identifier: Apache-2.0
//
// Compares docs/driver-channels.md, its schema and its example with the reader.
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <string>

#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/channels/ChannelFile.h"
#include "platform/linux/channels/JsonSchema.h"
#include "platform/linux/channels/KernelSoundChannels.h"
#include "platform/linux/channels/PublishedChannels.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using testing::HasSubstr;
using testing::SizeIs;

std::string textOf(const std::string& name) {
  std::ifstream file(TONEWERK_SOURCE_DIR "/" + name);
  EXPECT_TRUE(file) << name;
  return {std::istreambuf_iterator<char>(file), {}};
}

const std::string& page() {
  static const std::string text = textOf("docs/driver-channels.md");
  return text;
}

bool isRead(const std::string& text) {
  ChannelFileProblem problem;
  return ChannelFile::parse(text, problem).has_value();
}

TEST(ChannelDocumentationTest, ShowsAFileThatIsRead) {
  constexpr std::string_view kBegin = "```json\n";
  const std::size_t begin = page().find(kBegin) + kBegin.size();
  const std::string shown = page().substr(begin, page().find("```", begin) - begin);
  ChannelFileProblem problem;
  const auto file = ChannelFile::parse(shown, problem);
  ASSERT_TRUE(file) << problem.text;
  EXPECT_EQ(file->driver, "Amp Drv<0x1>");
  EXPECT_THAT(file->records, SizeIs(3));
}

TEST(ChannelDocumentationTest, HasAnExampleThatIsReadAndFitsTheSchema) {
  const std::string example = textOf("examples/driver-channels.json");
  EXPECT_TRUE(isRead(example));
  EXPECT_TRUE(JsonSchema(json::parse(textOf("docs/driver-channels.schema.json"))).fits(json::parse(example)));
}

TEST(ChannelDocumentationTest, HasASchemaThatAgreesWithTheReader) {
  const JsonSchema schema(json::parse(textOf("docs/driver-channels.schema.json")));
  const auto channel = [](const std::string& fields) {
    return R"({"driver": "d", "channels": [{"group": "g", "name": "n", )" + fields + "}]}";
  };
  const auto state = [&](const std::string& fields) {
    return channel(R"("format": "state", "states": [{)" + fields + "}]");
  };
  const auto bucket = [&](const std::string& fields) {
    return channel(R"("format": "histogram", "min": 1, "max": 2, "buckets": [{)" + fields + "}]");
  };
  for (const std::string& good :
       {std::string(R"({"driver": "", "channels": []})"), channel(R"("format": "simple", "value": 1)"),
        channel(R"("format": "simple", "value": -9223372036854775808)"),
        channel(R"("format": "vector", "value": "any")"), channel(R"("format": "invalid", "more": null)"),
        channel(R"("subgroup": "s", "unit": "u", "format": "simple", "value": 9223372036854775807)"),
        bucket(R"("hits": 1)"), bucket(R"("lower": -1, "upper": 1, "hits": 1)"),
        state(R"("name": "", "transitions": 18446744073709551615, "residency": 0, "duty_cycle": 0.5)")}) {
    EXPECT_TRUE(schema.fits(json::parse(good))) << good;
    EXPECT_TRUE(isRead(good)) << good;
  }
  for (const std::string& bad :
       {std::string("[]"),
        std::string(R"({"driver": "d"})"),
        std::string(R"({"channels": []})"),
        std::string(R"({"driver": 1, "channels": []})"),
        std::string(R"({"driver": "d", "channels": [1]})"),
        std::string(R"({"driver": "d", "channels": [{"name": "n", "format": "simple", "value": 1}]})"),
        channel(R"("format": 1)"),
        channel(R"("format": "simple")"),
        channel(R"("format": "simple", "value": "1")"),
        channel(R"("format": "simple", "value": 1.5)"),
        channel(R"("format": "simple", "value": 9223372036854775808)"),
        channel(R"("subgroup": null, "format": "simple", "value": 1)"),
        channel(R"("unit": 1, "format": "simple", "value": 1)"),
        channel(R"("format": "histogram", "min": 1, "buckets": [])"),
        bucket(R"("lower": 1, "upper": 1)"),
        bucket(R"("lower": null, "hits": 1)"),
        channel(R"("format": "state", "states": {})"),
        state(R"("name": "", "transitions": 1, "residency": -1, "duty_cycle": 0.5)"),
        state(R"("name": "", "transitions": 18446744073709551616, "residency": 1, "duty_cycle": 0.5)"),
        state(R"("name": "", "transitions": 1, "residency": 1, "duty_cycle": "all")"),
        state(R"("name": "", "transitions": 1, "residency": 1)")}) {
    EXPECT_FALSE(schema.fits(json::parse(bad))) << bad;
    EXPECT_FALSE(isRead(bad)) << bad;
  }
}

TEST(ChannelDocumentationTest, NamesEveryFailureAndBound) {
  EXPECT_EQ(Chanmeter::kErrorNoEarlierSamples, 1);
  const std::pair<std::int64_t, const char*> failures[] = {
      {Chanmeter::kErrorNoEarlierSamples, "no sample at the session's start"},
      {kChannelsUnreadable, "not a regular file"},
      {kChannelsTooLarge, "larger than 1 MiB"},
      {kChannelsNotJson, "not JSON"},
      {kChannelsFieldMissing, "missing"},
      {kChannelsWrongType, "wrong type"},
      {kChannelsOutOfRange, "cannot hold"},
      {kChannelsUnsettled, "changed during every reading"},
      {kChannelsTooMany, "above a limit"},
      {kChannelsNotUnderstood, "unexpected form"},
  };
  for (const auto& [code, words] : failures) {
    const std::size_t row = page().find("\n| " + std::to_string(code) + " | ");
    ASSERT_NE(row, std::string::npos) << code;
    EXPECT_THAT(page().substr(row + 1, page().find('\n', row + 1) - row), HasSubstr(words));
  }
  static_assert(PublishedChannels::kMaxFileBytes == std::size_t{1} << 20);
  static_assert(PublishedChannels::kMaxBytes == std::size_t{8} << 20);
  static_assert(PublishedChannels::kMaxChannels == 32768);
  static_assert(PublishedChannels::kMaxEntries == 4096);
  EXPECT_THAT(page(), HasSubstr("| a file | 1 MiB |"));
  EXPECT_THAT(page(), HasSubstr("| files | " + std::to_string(PublishedChannels::kMaxFiles) + ", and 8 MiB"));
  EXPECT_THAT(page(), HasSubstr("| channels | 32,768 "));
  EXPECT_THAT(page(), HasSubstr("| entries of the directory | 4,096,"));
  EXPECT_THAT(page(), HasSubstr("| substreams of sound cards | " +
                                std::to_string(KernelSoundChannels::kMaxSubstreams) + " |"));
}

}  // namespace
}  // namespace tonewerk

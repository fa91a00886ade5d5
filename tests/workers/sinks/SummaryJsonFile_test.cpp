// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/SummaryJsonFile.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr char kDirectory[] = "/logs";
constexpr char kPath[] = "/logs/a.json";

const ValueMap kGood{{"n", 1}};
const ValueMap kUnsayable{{"n", std::nan("")}};

class SummaryJsonFileTest : public ReportingTest {
 protected:
  std::string written(const std::vector<ValueMap>& payloads) {
    SummaryJsonFile file(kDirectory, "a.json");
    for (const ValueMap& payload : payloads) file.writeMessage(kCategorySetup, kTypeStart, payload);
    EXPECT_TRUE(file.closeFile());
    return test.files.contents(kPath).value_or("no file");
  }
  // The file's lines. The lines of an entry are shown as the name of its member.
  std::vector<std::string> shapeOf(const std::vector<ValueMap>& payloads) {
    const std::string text = written(payloads);
    std::vector<std::string> shape;
    std::string entry;
    for (std::size_t at = 0, end = 0; (end = text.find('\n', at)) != std::string::npos; at = end + 1) {
      const std::string line = text.substr(at, end - at);
      if (line == "{" || !entry.empty()) {
        entry += line;
        if (line != "}") continue;
        shape.push_back(nlohmann::json::parse(entry).begin().key());
        entry.clear();
      } else {
        shape.push_back(line);
      }
    }
    const nlohmann::json whole = nlohmann::json::parse(text, nullptr, false);
    EXPECT_TRUE(whole.is_array()) << text;
    return shape;
  }
};

TEST_F(SummaryJsonFileTest, LinesOfCommasSeparateTheEntries) {
  EXPECT_THAT(shapeOf({kGood, kGood}), ElementsAre("[", "Setup_Start_1", ",", "Setup_Start_2", "]"));
}

TEST_F(SummaryJsonFileTest, WithoutAMessageThereIsNoFile) { EXPECT_EQ(written({}), "no file"); }

TEST_F(SummaryJsonFileTest, AMiddleEntryThatIsNotValidJsonIsAnEmptyLineWithoutAComma) {
  EXPECT_THAT(shapeOf({kGood, kUnsayable, kGood}),
              ElementsAre("[", "Setup_Start_1", "", ",", "Setup_Start_3", "]"));
}

TEST_F(SummaryJsonFileTest, AFirstEntryThatIsNotValidJsonHasNoCommaAfterIt) {
  EXPECT_THAT(shapeOf({kUnsayable, kGood, kGood}),
              ElementsAre("[", "", "Setup_Start_2", ",", "Setup_Start_3", "]"));
}

TEST_F(SummaryJsonFileTest, ALastEntryThatIsNotValidJsonHasNoCommaBeforeIt) {
  EXPECT_THAT(shapeOf({kGood, kUnsayable}), ElementsAre("[", "Setup_Start_1", "", "]"));
}

TEST_F(SummaryJsonFileTest, AFileWithoutAValidEntryIsAnEmptyArray) {
  EXPECT_THAT(shapeOf({kUnsayable, kUnsayable}), ElementsAre("[", "", "", "]"));
}

TEST_F(SummaryJsonFileTest, NanAndBothInfinitiesAtAnyDepthAreLoggedOnceEach) {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  written({{{"n", std::nan("")}}, {{"n", kInfinity}}, {{"n", ValueMap{{"deep", ValueArray({-kInfinity})}}}}});
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError),
              ElementsAre(StartsWith("dataWithJSONObject: "), StartsWith("dataWithJSONObject: "),
                          StartsWith("dataWithJSONObject: ")));
}

TEST_F(SummaryJsonFileTest, OnlyTheFirstLineThatCannotBeWrittenIsLogged) {
  SummaryJsonFile file(kDirectory, "a.json");
  test.files.failWrite(2, std::errc::no_space_on_device);  // the end of "["
  file.writeMessage(kCategorySetup, kTypeStart, kGood);
  test.files.failWrite(2, std::errc::no_space_on_device);  // the end of ","
  file.writeMessage(kCategorySetup, kTypeStart, kGood);
  EXPECT_FALSE(file.closeFile());
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError),
              ElementsAre(StartsWith("SummaryJsonFileWorker failed to write line."),
                          StartsWith("SummaryJsonFileWorker failed to closed file.")));
}

// The lines of many messages are written at once.
TEST_F(SummaryJsonFileTest, AFileOfManyBlocksHasEveryLineInOrder) {
  std::vector<ValueMap> payloads;
  std::string expected = "[\n";
  std::string separator;
  for (int made = 0; made < 3'000; ++made) {
    const std::string name = "Setup_Start_" + std::to_string(made + 1);
    payloads.push_back(made % 500 == 499 ? kUnsayable
                                         : ValueMap{{"n", made}, {"text", std::string(300, 'x')}});
    std::string problem;
    const auto text = test.json.pretty(ValueMap{{name, payloads.back()}}, problem);
    expected += text ? separator + *text + "\n" : "\n";
    separator = ",\n";
  }
  EXPECT_GT(expected.size(), std::size_t{1} << 20U);
  EXPECT_EQ(written(payloads), expected + "]\n");
}

TEST_F(SummaryJsonFileTest, ABlockThatCannotBeWrittenIsLoggedBeforeALaterProblem) {
  SummaryJsonFile file(kDirectory, "a.json");
  file.writeMessage(kCategorySetup, kTypeStart, kGood);
  test.files.failWrite(2, std::errc::no_space_on_device);
  file.writeMessage(kCategorySetup, kTypeStart, kUnsayable);
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError),
              ElementsAre(StartsWith("SummaryJsonFileWorker failed to write line."),
                          StartsWith("dataWithJSONObject: ")));
}

TEST_F(SummaryJsonFileTest, AFileThatIsNotClosedDoesNotAppear) {
  {
    SummaryJsonFile file(kDirectory, "a.json");
    file.writeMessage(kCategorySetup, kTypeStart, kGood);
    EXPECT_THAT(test.files.files(), IsEmpty());
  }
  EXPECT_THAT(test.files.files(), IsEmpty());
  EXPECT_EQ(test.files.openFiles(), 0);
}

TEST_F(SummaryJsonFileTest, ANameThatIsTakenWhileTheFileIsWrittenIsNotReplaced) {
  SummaryJsonFile file(kDirectory, "a.json");
  file.writeMessage(kCategorySetup, kTypeStart, kGood);
  test.files.addFile(kPath, "faster");
  test.files.addFile("/logs/a-2.json", "faster still");
  EXPECT_TRUE(file.closeFile());
  EXPECT_EQ(test.files.contents(kPath), "faster");
  EXPECT_EQ(test.files.contents("/logs/a-2.json"), "faster still");
  EXPECT_TRUE(test.files.contents("/logs/a-3.json").has_value());
  EXPECT_THAT(test.log.textsOf("twru"),
              ElementsAre("SummaryJsonFileWorker opened file. action=open file=/logs/a.json",
                          "SummaryJsonFileWorker closed file. action=close file=/logs/a-3.json"));
}

TEST_F(SummaryJsonFileTest, ANameThatBecomesTooLongWithItsNumberCannotBeOpenedAndIsLogged) {
  const std::string name = std::string(250, 'a') + ".json";
  test.files.addFile("/logs/" + name, "");
  SummaryJsonFile file(kDirectory, name);
  file.writeMessage(kCategorySetup, kTypeStart, kGood);
  EXPECT_FALSE(file.closeFile());
  EXPECT_THAT(test.files.files(), SizeIs(1));
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError),
              ElementsAre(StartsWith("SummaryJsonFileWorker failed to open file. action=open file=/logs/" +
                                     std::string(250, 'a') + "-2.json error=\"")));
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/ChannelPrinter.h"

#include <gmock/gmock.h>
#include <sstream>
#include <string>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ChannelRecords.h"
#include "support/ScopedTimeZone.h"
#include "support/memory/MemoryChanmeter.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/show/ChannelText.h"

namespace tonewerk {
namespace {

using channels::histogram;
using channels::keyIn;
using channels::simple;
using channels::speaker;
using channels::states;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

constexpr double kTime = 1763633880.5;

class ChannelPrinterTest : public testing::Test {
 protected:
  const ScopedTimeZone zone_{"UTC0"};
  std::string values() {
    out_.str({});
    succeeded_ = printer_.printValues();
    return out_.str();
  }
  std::string changes() {
    out_.str({});
    printer_.printChanges(kTime);
    return out_.str();
  }

  std::ostringstream out_;
  std::ostringstream err_;
  NlohmannJsonService json_;
  Tool tool_{out_, err_, json_};
  MemoryChanmeter chanmeter_;
  ChannelFilter filter_;
  ChannelPrinter printer_{tool_, chanmeter_, filter_};
  bool succeeded_ = false;
};

TEST_F(ChannelPrinterTest, PrintsATableForPeople) {
  ChanmeterRecord delay = histogram(speaker("Delay"), {{0, 10, 5}, {10, 20, 0}, {{}, 100, 2}});
  delay.key.subGroup = "Queue";
  delay.unit = "us";
  delay.minimum = 1;
  delay.maximum = 90;
  chanmeter_.setRecords({simple(speaker("Volts"), 12), delay,
                         states(keyIn("pdm", "Mic"), {{"on", 1, 200, 2.0 / 3}, {"off", 0, 0, 0}})});
  EXPECT_EQ(values(),
            "driver  group    subgroup  name   value                    unit\n"
            "Amp     Speaker            Volts  12                       \n"
            "Amp     Speaker  Queue     Delay  0-10: 5, ?: 2 (1 to 90)  us\n"
            "Amp     pdm                Mic    on: 200 (66.7 %)         \n");
  EXPECT_TRUE(succeeded_);
}

TEST_F(ChannelPrinterTest, PrintsFieldsAsTheyArePublishedForPrograms) {
  tool_.asJson = true;
  ChanmeterRecord delay = histogram(speaker("Delay"), {{0, 10, 5}, {{}, 100, 2}});
  delay.key.subGroup = "Queue";
  delay.unit = "us";
  delay.minimum = 1;
  delay.maximum = 90;
  chanmeter_.setRecords(
      {simple(speaker("Volts"), 12), delay, states(keyIn("pdm", "Mic"), {{"on", 1, 200, 0.5}}),
       channels::ofFormat(keyIn("pdm", "x"), 4), channels::ofFormat(keyIn("pdm", "y"), 255)});
  EXPECT_EQ(values(), R"({"driver":"Amp","group":"Speaker","name":"Volts","format":"simple","value":12})"
                      "\n"
                      R"({"driver":"Amp","group":"Speaker","subgroup":"Queue","name":"Delay","unit":"us",)"
                      R"("format":"histogram","min":1,"max":90,)"
                      R"("buckets":[{"lower":0,"upper":10,"hits":5},{"hits":2}]})"
                      "\n"
                      R"({"driver":"Amp","group":"pdm","name":"Mic","format":"state",)"
                      R"("states":[{"name":"on","transitions":1,"residency":200,"duty_cycle":0.5}]})"
                      "\n"
                      R"({"driver":"Amp","group":"pdm","name":"x","format":"simple_array"})"
                      "\n"
                      R"({"driver":"Amp","group":"pdm","name":"y","format":255})"
                      "\n");
}

TEST_F(ChannelPrinterTest, PrintsNothingWithoutChannels) {
  EXPECT_THAT(values(), IsEmpty());
  EXPECT_TRUE(succeeded_);
}

TEST_F(ChannelPrinterTest, ShowsWhatThePatternsFit) {
  chanmeter_.setRecords({simple(keyIn("Tx", "a", "Amp"), 1), simple(keyIn("Rx", "b", "Amp"), 1),
                         simple(keyIn("Tx", "c", "Mic"), 1), simple(keyIn({}, "d", {}), 1)});
  tool_.asJson = true;
  filter_.driver = "A*";
  EXPECT_THAT(values(), testing::AllOf(HasSubstr("\"a\""), HasSubstr("\"b\""), Not(HasSubstr("\"c\"")),
                                       Not(HasSubstr("\"d\""))));
  filter_.group = "[T]x";
  EXPECT_THAT(values(), testing::AllOf(HasSubstr("\"a\""), Not(HasSubstr("\"b\""))));
}

TEST_F(ChannelPrinterTest, SaysThatSomethingFailedBesideWhatIsThere) {
  chanmeter_.setRecords({simple(speaker("Volts"), 12)});
  chanmeter_.fail(MemoryChanmeter::Operation::kCopyChannels, {.code = 5, .returnsResult = true});
  EXPECT_THAT(values(), HasSubstr("Volts"));
  EXPECT_FALSE(succeeded_);
  chanmeter_.fail(MemoryChanmeter::Operation::kCreateSamples, {.code = 5});
  EXPECT_THAT(values(), IsEmpty());
  EXPECT_FALSE(succeeded_);
}

TEST_F(ChannelPrinterTest, PrintsWhatChangedSinceTheLastTimeInABlock) {
  chanmeter_.setRecords({simple(speaker("a"), 1), simple(speaker("still"), 1)});
  EXPECT_THAT(changes(), IsEmpty());
  chanmeter_.setRecords({simple(speaker("a"), 8), simple(speaker("still"), 1), simple(speaker("new"), 1)});
  EXPECT_EQ(changes(),
            "2025-11-20 10:18:00.500Z\n"
            "driver  group    subgroup  name  value  unit\n"
            "Amp     Speaker            a     7      \n"
            "\n");
  EXPECT_EQ(changes(), "2025-11-20 10:18:00.500Z\nnothing changed\n\n");
}

TEST_F(ChannelPrinterTest, PutsTheTimeIntoEachLineForPrograms) {
  tool_.asJson = true;
  tool_.outIsTerminal = true;
  chanmeter_.setRecords({simple(speaker("a"), 1)});
  EXPECT_THAT(changes(), IsEmpty());
  chanmeter_.setRecords({simple(speaker("a"), -3)});
  EXPECT_EQ(changes(),
            R"({"at":1763633880.5,"driver":"Amp","group":"Speaker","name":"a","format":"simple","value":-4})"
            "\n");
  EXPECT_THAT(changes(), IsEmpty());
}

TEST_F(ChannelPrinterTest, ClearsATerminalBeforeEachBlock) {
  tool_.outIsTerminal = true;
  EXPECT_THAT(changes(), IsEmpty());
  EXPECT_THAT(changes(), StartsWith("\x1b[H\x1b[2J2025"));
}

TEST_F(ChannelPrinterTest, ContinuesAfterAFailedRead) {
  chanmeter_.setRecords({simple(speaker("a"), 1)});
  changes();
  chanmeter_.fail(MemoryChanmeter::Operation::kCreateSamples, {.code = 5});
  EXPECT_THAT(changes(), IsEmpty());
  chanmeter_.stopFailing();
  chanmeter_.setRecords({simple(speaker("a"), 3)});
  EXPECT_THAT(changes(), HasSubstr(" 2 "));
}

TEST_F(ChannelPrinterTest, CallsEachFormatChangedByItsOwnCounts) {
  tool_.asJson = true;
  const auto count = [this] {
    const std::string lines = changes();
    return std::count(lines.begin(), lines.end(), '\n');
  };
  chanmeter_.setRecords({histogram(speaker("h"), {{0, 1, 0}}), states(speaker("s"), {{"on", 0, 0, 0}}),
                         states(speaker("t"), {{"on", 0, 0, 0}}), channels::ofFormat(speaker("x"), 255)});
  count();
  EXPECT_EQ(count(), 0);
  chanmeter_.setRecords({histogram(speaker("h"), {{0, 1, 1}}), states(speaker("s"), {{"on", 0, 1, 0}}),
                         states(speaker("t"), {{"on", 1, 0, 0}}), channels::ofFormat(speaker("x"), 255)});
  EXPECT_EQ(count(), 3);
}

TEST_F(ChannelPrinterTest, SendsNoControlCharactersToATerminal) {
  chanmeter_.setRecords({simple(keyIn("g\x1b[2J", "n\xC2\x9B", "d\n\x7F"), 1),
                         states(keyIn("g", "Überlauf"), {{"\x1b", 1, 1, 1}})});
  const std::string shown = values();
  EXPECT_THAT(shown, HasSubstr("d\\n\\u007f"));
  EXPECT_THAT(shown, HasSubstr("g\\u001b[2J"));
  EXPECT_THAT(shown, HasSubstr("n\\u009b "));
  EXPECT_THAT(shown, HasSubstr("Überlauf"));
  EXPECT_THAT(shown, HasSubstr("\\u001b: 1 (100 %)"));
  tool_.asJson = true;
  EXPECT_THAT(values(), AllOf(HasSubstr("\"name\":\"n\\u009b\""), HasSubstr("\"driver\":\"d\\n\\u007f\"")));
}

}  // namespace
}  // namespace tonewerk

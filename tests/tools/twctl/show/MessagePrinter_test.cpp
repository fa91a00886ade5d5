// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/MessagePrinter.h"

#include <gtest/gtest.h>
#include <sstream>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedTimeZone.h"
#include "tools/twctl/Tool.h"

namespace tonewerk {
namespace {

class MessagePrinterTest : public testing::Test {
 protected:
  const ScopedTimeZone zone_{"UTC0"};
  MessagePrinterTest() { tool.asJson = false; }

  // Returns what was printed since the last call.
  std::string printed() {
    const std::string text = out.str();
    out.str({});
    return text;
  }

  ValueMap message{{"reporterID", 77},
                   {"serviceType", 2},
                   {"category", 4},
                   {"type", 1},
                   {"redundant", false},
                   {"time", 1763634000.5},
                   {"application", "com.example.phone"},
                   {"payload", ValueMap{{"volume", 0.5}}}};
  NlohmannJsonService json;
  std::ostringstream out;
  std::ostringstream err;
  Tool tool{out, err, json};
  MessagePrinter printer{tool};
};

TEST_F(MessagePrinterTest, PrintsAMessageOnALine) {
  printer.print(message);
  EXPECT_EQ(printed(), "2025-11-20 10:20:00.500Z  77  telephony  Playback/Start  {\"volume\":0.5}\n");
}

TEST_F(MessagePrinterTest, MarksARedundantOne) {
  message.set("redundant", true);
  printer.print(message);
  EXPECT_EQ(printed(),
            "2025-11-20 10:20:00.500Z  77  telephony  Playback/Start  (redundant)  {\"volume\":0.5}\n");
}

TEST_F(MessagePrinterTest, MakesControlCharactersHarmless) {
  message.set("payload", ValueMap{{"k\x7F", "b\x1b[2J\xC2\x9B\n"}});
  message.set("application", "a\xE2\x80\xAE");
  printer.print(message);
  const std::string payload = R"({"k\u007f":"b\u001b[2J\u009b\n"})";
  EXPECT_EQ(printed(), "2025-11-20 10:20:00.500Z  77  telephony  Playback/Start  " + payload + "\n");
  tool.asJson = true;
  printer.print(message);
  EXPECT_EQ(printed(), R"({"reporterID":77,"serviceType":2,"category":4,"type":1,"redundant":false,)"
                       R"("time":1763634000.5,"application":"a\u202e","serviceName":"telephony",)"
                       R"("categoryName":"Playback","typeName":"Start","payload":)" +
                           payload + "}\n");
}

TEST_F(MessagePrinterTest, SaysHowManyWereMissed) {
  printer.printMissed(12);
  printer.printMissed(1);
  EXPECT_EQ(printed(), "... missed 12 messages\n... missed 1 message\n");
}

TEST_F(MessagePrinterTest, PrintsObjectsForPrograms) {
  tool.asJson = true;
  printer.print(message);
  EXPECT_EQ(printed(), R"({"reporterID":77,"serviceType":2,"category":4,"type":1,"redundant":false,)"
                       R"("time":1763634000.5,"application":"com.example.phone","serviceName":"telephony",)"
                       R"("categoryName":"Playback","typeName":"Start","payload":{"volume":0.5}})"
                       "\n");
  printer.printMissed(12);
  EXPECT_EQ(printed(), "{\"missed\":12}\n");
}

}  // namespace
}  // namespace tonewerk

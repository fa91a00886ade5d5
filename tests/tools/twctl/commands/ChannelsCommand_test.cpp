// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/TemporaryDirectory.h"
#include "tools/twctl/commands/Commands.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;

// The tests select channels by the driver's name, which excludes the machine's own sound cards.
class ChannelsCommandTest : public testing::Test {
 protected:
  ChannelsCommandTest() {
    std::filesystem::create_directory(directory_.path("channels"));
    setenv("RUNTIME_DIRECTORY", directory_.path().c_str(), 1);
  }
  void TearDown() override { unsetenv("RUNTIME_DIRECTORY"); }

  std::string publish(const std::string& name, const std::string& text) const {
    const std::string path = directory_.path("channels/" + name);
    std::ofstream(path) << text;
    return path;
  }
  int run(std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), "twctl");
    out_.str({});
    err_.str({});
    Tool tool{out_, err_, json_};
    return runCommandLine(static_cast<int>(arguments.size()), arguments.data(), tool);
  }

  TemporaryDirectory directory_;
  NlohmannJsonService json_;
  std::ostringstream out_;
  std::ostringstream err_;
};

TEST_F(ChannelsCommandTest, ShowsTheExample) {
  std::filesystem::copy(TONEWERK_SOURCE_DIR "/examples/driver-channels.json",
                        directory_.path("channels/amp.json"));
  EXPECT_EQ(run({"channels", "--driver", "Amp*"}), kDone);
  EXPECT_THAT(err_.str(), IsEmpty());
  EXPECT_EQ(out_.str(),
            "driver        group    subgroup  name        value                            unit\n"
            "Amp Drv<0x1>  Speaker            Rail Volts  12                               mV\n"
            "Amp Drv<0x1>  Tx       Queue     Delay       0-10: 5, 10-100: 2 (1 to 90)     us\n"
            "Amp Drv<0x1>  pdm                Mic         on: 200 (50 %), off: 200 (50 %)  ms\n");
  EXPECT_EQ(run({"channels", "--json", "--group", "Speaker", "--driver", "Amp*"}), kDone);
  EXPECT_EQ(out_.str(),
            R"({"driver":"Amp Drv<0x1>","group":"Speaker","name":"Rail Volts","unit":"mV","format":"simple",)"
            R"("value":12})"
            "\n");
}

TEST_F(ChannelsCommandTest, NamesWhatIsWrongAndShowsTheRest) {
  publish(
      "good.json",
      R"({"driver": "Good", "channels": [{"group": "Tx", "name": "n", "format": "simple", "value": 1}]})");
  const std::string bad = publish("bad.json", R"({"driver": "Bad"})");
  EXPECT_EQ(run({"channels", "--driver", "Good"}), kRefused);
  EXPECT_THAT(out_.str(), HasSubstr("Good"));
  EXPECT_EQ(err_.str(),
            "twctl: " + bad + ": /channels is missing (failure 5; the channels concerned are left out)\n");
}

TEST_F(ChannelsCommandTest, ShowsNothingWhereNothingIsPublished) {
  EXPECT_EQ(run({"channels", "--driver", "Amp*"}), kDone);
  EXPECT_THAT(out_.str(), IsEmpty());
}

TEST_F(ChannelsCommandTest, RefusesIntervalsThatAreNone) {
  for (const char* wrong : {"0", "-1", "0.01", "86401", "soon", "1s", "nan", "inf"}) {
    EXPECT_EQ(run({"channels", "--watch", wrong}), kWrongUsage) << wrong;
    EXPECT_THAT(err_.str(), HasSubstr("--watch")) << wrong;
  }
  EXPECT_EQ(run({"channels", "--watch", "1", "2"}), kWrongUsage);
}

// The command ends when its output is closed.
TEST_F(ChannelsCommandTest, TakesAnIntervalOrNone) {
  for (const std::vector<const char*>& arguments : std::vector<std::vector<const char*>>{
           {"channels", "--watch"}, {"channels", "--watch", "2.5"}, {"channels", "--watch", "--json"}}) {
    out_.setstate(std::ios::badbit);  // which ends the command
    EXPECT_EQ(run(arguments), kRefused);
    out_.clear();
    EXPECT_EQ(err_.str(), "twctl: cannot write the output\n");
  }
}

}  // namespace
}  // namespace tonewerk

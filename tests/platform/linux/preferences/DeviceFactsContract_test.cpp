// SPDX-License-Identifier: Apache-2.0
#include <fstream>
#include <gmock/gmock.h>
#include <memory>

#include "platform/linux/preferences/TomlDeviceFacts.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryDeviceFacts.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class TomlDeviceFactsTest : public testing::Test {
 protected:
  std::unique_ptr<TomlDeviceFacts> factsOf(const std::string& text) {
    std::ofstream(directory_.path("device-facts.toml")) << text;
    return std::make_unique<TomlDeviceFacts>(directory_.path("device-facts.toml"), category_);
  }

  TemporaryDirectory directory_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
};

// The contract of all sources of device facts. The facts are InternalBuild true, Released false, Text "true"
// and Number 1.
void expectContract(const DeviceFacts& facts) {
  EXPECT_EQ(facts.boolean("InternalBuild"), true);
  EXPECT_EQ(facts.boolean("Released"), false);
  EXPECT_EQ(facts.boolean("Text"), std::nullopt);
  EXPECT_EQ(facts.boolean("Number"), std::nullopt);
  EXPECT_EQ(facts.boolean("Missing"), std::nullopt);
}

TEST_F(TomlDeviceFactsTest, StatesWhatTheFileSays) {
  expectContract(*factsOf("InternalBuild = true\nReleased = false\nText = \"true\"\nNumber = 1\n"));
}

TEST(MemoryDeviceFactsTest, StatesWhatTheTestSays) {
  MemoryDeviceFacts facts;
  facts.set("InternalBuild", true);
  facts.set("Released", false);
  facts.set("Text", "true");
  facts.set("Number", 1);
  expectContract(facts);
}

TEST_F(TomlDeviceFactsTest, AMissingFileStatesNothing) {
  const TomlDeviceFacts facts(directory_.path("nowhere.toml"), category_);
  EXPECT_EQ(facts.boolean("InternalBuild"), std::nullopt);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TomlDeviceFactsTest, AFileThatDoesNotParseStatesNothingAndIsLogged) {
  EXPECT_EQ(factsOf("InternalBuild = true\noops\n")->boolean("InternalBuild"), std::nullopt);
  EXPECT_THAT(log_.textsOf("twrs"), ElementsAre(HasSubstr("device-facts.toml:2:")));
}

TEST_F(TomlDeviceFactsTest, FactsThatTheDaemonCannotUseAreLogged) {
  factsOf("InternalBild = true\nHapticLeakCapture = 1\n");
  EXPECT_THAT(
      log_.textsOf("twrs", LogLevel::kError),
      ElementsAre("the daemon does not read InternalBild of device-facts; did you mean 'InternalBuild'?",
                  "device-facts: HapticLeakCapture must be true or false, not 1"));
}

TEST_F(TomlDeviceFactsTest, FactsChangeWhenTheyAreReadAgainAndNotBefore) {
  const auto facts = factsOf("InternalBuild = true\n");
  factsOf("InternalBuild = false\n");
  EXPECT_EQ(facts->boolean("InternalBuild"), true);
  facts->readAgain();
  EXPECT_EQ(facts->boolean("InternalBuild"), false);
}

TEST_F(TomlDeviceFactsTest, AFileThatIsBrokenWhenItIsReadAgainStatesNothingAndIsLogged) {
  const auto facts = factsOf("InternalBuild = true\n");
  std::ofstream(directory_.path("device-facts.toml")) << "oops\n";
  facts->readAgain();
  EXPECT_EQ(facts->boolean("InternalBuild"), std::nullopt);
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), ElementsAre(HasSubstr("device-facts.toml:1:")));
}

}  // namespace
}  // namespace tonewerk

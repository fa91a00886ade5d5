// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "tools/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;

TEST_F(CommandLineTest, SetsPreferences) {
  EXPECT_EQ(run({"defaults", "read", "a.b"}), kRefused);
  EXPECT_EQ(run({"defaults", "write", "a.b", "list", "[1, \"x\"]"}), kDone);
  EXPECT_EQ(run({"defaults", "write", "a.b", "text", "some words"}), kDone);
  EXPECT_EQ(run({"defaults", "write", "a.b", "number", "-5"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "a.b", "list", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"key\":\"list\",\"value\":[1,\"x\"]}\n");
  EXPECT_EQ(run({"defaults", "read", "a.b"}), kDone);
  EXPECT_THAT(output(), HasSubstr("text    some words\n"));
  EXPECT_THAT(output(), HasSubstr("number  -5\n"));
  EXPECT_EQ(run({"defaults", "delete", "a.b", "text"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "a.b", "text"}), kRefused);
  EXPECT_EQ(run({"defaults", "delete", "a.b", "text"}), kRefused);
}

TEST_F(CommandLineTest, DoesNotDeleteWhatIsConfigured) {
  std::filesystem::create_directories(directory_.path("configuration/preferences"));
  write("configuration/preferences/a.b.toml", "key = 5\n");
  EXPECT_EQ(run({"defaults", "delete", "a.b", "key"}), kRefused);
  EXPECT_THAT(errors(), testing::Not(IsEmpty()));
  EXPECT_EQ(run({"defaults", "read", "a.b", "key"}), kDone);
}

class AnnouncedDefaultsTest : public CommandLineTest {
 protected:
  AnnouncedDefaultsTest() { std::filesystem::create_directory(directory_.path("runtime")); }

  // The names posted since the last call.
  std::vector<std::string> posted() {
    std::vector<std::string> names;
    std::error_code none;
    const std::filesystem::path notifications = directory_.path("runtime/notifications");
    for (const auto& entry : std::filesystem::directory_iterator(notifications, none)) {
      names.push_back(entry.path().filename().string());
    }
    std::filesystem::remove_all(notifications);
    return names;
  }
};

TEST_F(AnnouncedDefaultsTest, TellsTheDaemonOfWhatItFollows) {
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone);
  EXPECT_THAT(posted(), testing::ElementsAre("com.orvane.tonewerk.reporting"));
  EXPECT_EQ(run({"defaults", "delete", "com.orvane.tonewerk", "device_name"}), kDone);
  EXPECT_THAT(posted(), testing::ElementsAre("com.orvane.tonewerk.reporting"));
  EXPECT_EQ(run({"defaults", "write", "com.orvane.homedeck", "spatial-audio-accessory-feature", "1"}), kDone);
  EXPECT_THAT(posted(), testing::ElementsAre("com.orvane.homedeck.spatial-audio-accessory-feature.changed"));
}

TEST_F(AnnouncedDefaultsTest, TellsNobodyOfWhatNobodyFollowsOrDidNotChange) {
  EXPECT_EQ(run({"defaults", "write", "com.orvane.homedeck", "device_name", "1"}), kDone);
  EXPECT_EQ(run({"defaults", "write", "com.orvane.metricon", "device_name", "1"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "com.orvane.homedeck"}), kDone);
  EXPECT_EQ(run({"defaults", "delete", "com.orvane.tonewerk", "device_name"}), kRefused);
  EXPECT_THAT(posted(), IsEmpty());
}

TEST_F(AnnouncedDefaultsTest, WithoutARuntimeDirectoryThereIsNobodyToTell) {
  std::filesystem::remove(directory_.path("runtime"));
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone);
  EXPECT_THAT(errors(), IsEmpty());
  EXPECT_FALSE(std::filesystem::exists(directory_.path("runtime")));
}

TEST_F(AnnouncedDefaultsTest, AChangeThatCannotBeToldHoldsAndSaysSo) {
  write("runtime/notifications", "a file in the way");
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone);
  EXPECT_THAT(errors(), HasSubstr("a running daemon is not told of it: com.orvane.tonewerk.reporting: "));
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk", "device_name"}), kDone);
}

}  // namespace
}  // namespace tonewerk

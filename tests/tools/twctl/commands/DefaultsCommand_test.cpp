// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;

class DefaultsCommandTest : public CommandLineTest {
 protected:
  void configure(const std::string& domain, const std::string& text) {
    std::filesystem::create_directories(directory_.path("configuration/preferences"));
    write("configuration/preferences/" + domain + ".toml", text);
  }
  // Writes a value that must be refused for this reason, and checks that nothing has changed.
  void expectRefused(const std::string& domain, const std::string& key, const std::string& value,
                     const std::string& problem) {
    SCOPED_TRACE(key + " = " + value);
    EXPECT_EQ(run({"defaults", "write", domain, key, value}), kRefused);
    EXPECT_EQ(errors(), "twctl: " + problem + "\n");
    EXPECT_FALSE(std::filesystem::exists(directory_.path("state/preferences/" + domain + ".toml")));
  }
};

TEST_F(DefaultsCommandTest, SetsPreferences) {
  EXPECT_EQ(run({"defaults", "read", "a.b"}), kRefused);
  EXPECT_EQ(run({"defaults", "write", "a.b", "list", "[1, \"x\"]"}), kDone);
  EXPECT_EQ(run({"defaults", "write", "a.b", "text", "some words"}), kDone);
  EXPECT_EQ(run({"defaults", "write", "a.b", "number", "-5"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "a.b", "list", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"key\":\"list\",\"from\":\"state\",\"value\":[1,\"x\"]}\n");
  EXPECT_EQ(run({"defaults", "read", "a.b"}), kDone);
  EXPECT_THAT(output(), HasSubstr("text    state  some words\n"));
  EXPECT_THAT(output(), HasSubstr("number  state  -5\n"));
  EXPECT_EQ(run({"defaults", "delete", "a.b", "text"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "a.b", "text"}), kRefused);
  EXPECT_EQ(run({"defaults", "delete", "a.b", "text"}), kRefused);
}

TEST_F(DefaultsCommandTest, DoesNotDeleteWhatIsConfigured) {
  configure("a.b", "key = 5\n");
  EXPECT_EQ(run({"defaults", "delete", "a.b", "key"}), kRefused);
  EXPECT_THAT(errors(), testing::Not(IsEmpty()));
  EXPECT_EQ(run({"defaults", "read", "a.b", "key"}), kDone);
}

TEST_F(DefaultsCommandTest, ShowsWhatCountsAndWhereItIsFrom) {
  configure("com.orvane.linkreport", "backends = [\"local\"]\nevent_name_attribute = true\nmore = 1\n");
  EXPECT_EQ(run({"defaults", "write", "com.orvane.linkreport", "event_name_attribute", "false"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "com.orvane.linkreport"}), kDone);
  EXPECT_EQ(output(),
            "key                   from           value\n"
            "backends              configuration  [\"local\"]\n"
            "device_id             default        (none)\n"
            "event_name_attribute  state          false\n"
            "more                  configuration  1\n");
  EXPECT_EQ(run({"defaults", "read", "com.orvane.linkreport", "device_id", "--json"}), kDone);
  EXPECT_EQ(output(), "{\"key\":\"device_id\",\"from\":\"default\",\"value\":null}\n");
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk.store", "--json"}), kDone);
  EXPECT_EQ(output(),
            "{\"key\":\"max_megabytes\",\"from\":\"default\",\"value\":256}\n"
            "{\"key\":\"max_days\",\"from\":\"default\",\"value\":30}\n"
            "{\"key\":\"journal_megabytes\",\"from\":\"default\",\"value\":64}\n"
            "{\"key\":\"journal_sync_seconds\",\"from\":\"default\",\"value\":5}\n"
            "{\"key\":\"journal_days\",\"from\":\"default\",\"value\":0}\n");
}

TEST_F(DefaultsCommandTest, AsksForTheNameThatIsClose) {
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonwerk.store"}), kRefused);
  EXPECT_EQ(
      errors(),
      "twctl: nothing is set for com.orvane.tonwerk.store; did you mean 'com.orvane.tonewerk.store'?\n");
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk.store", "max_day"}), kRefused);
  EXPECT_EQ(errors(),
            "twctl: nothing is set for max_day of com.orvane.tonewerk.store; did you mean 'max_days'?\n");
  EXPECT_EQ(run({"defaults", "describe", "com.orvane.nothing"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the daemon does not read com.orvane.nothing"));
}

TEST_F(DefaultsCommandTest, RefusesWhatTheKeyCannotBe) {
  const std::string store = "com.orvane.tonewerk.store";
  expectRefused(store, "max_days", "soon", "max_days must be a number from 1, not \"soon\"");
  expectRefused(store, "max_days", "0.5", "max_days must be a number from 1, not 0.5");
  expectRefused(store, "max_days", "nan", "max_days must be a number from 1, not nan");
  expectRefused(store, "max_megabytes", "true", "max_megabytes must be a number from 1, not true");
  const std::string link = "com.orvane.linkreport";
  expectRefused(link, "event_name_attribute", "1", "event_name_attribute must be true or false, not 1");
  expectRefused(link, "backends", "local", "backends must be an array of texts, not \"local\"");
  expectRefused(link, "backends", "[5]", "backends must be an array of texts, not [5]");
  const std::string twreporting = "com.orvane.tonewerk.twreporting";
  expectRefused(twreporting, "io_cycle", "2.5", "io_cycle must be an integer from 0 to 2147483647, not 2.5");
  expectRefused(twreporting, "io_cycle", "2147483648",
                "io_cycle must be an integer from 0 to 2147483647, not 2147483648");
  expectRefused(twreporting, "wait_time", "10000001",
                "wait_time must be a number from 0 to 10000000, not 10000001");
  expectRefused(twreporting, "memory_tools", "[\"free\"]",
                "memory_tools must be an array of two texts, not [\"free\"]");
}

// In a domain of the daemon, such a key can only be a mistake.
TEST_F(DefaultsCommandTest, RefusesAKeyThatTheDaemonDoesNotReadInADomainOfItsOwn) {
  const std::string store = "com.orvane.tonewerk.store";
  expectRefused(store, "max_dais", "5",
                "the daemon does not read max_dais of com.orvane.tonewerk.store; did you mean 'max_days'?");
  expectRefused("com.orvane.tonewerk", "volume", "5",
                "the daemon does not read volume of com.orvane.tonewerk; there are device_name and "
                "disable_reporting");
  configure(store, "");
  std::filesystem::create_directories(directory_.path("state/preferences"));
  write("state/preferences/" + store + ".toml", "max_dais = 5\n");
  EXPECT_EQ(run({"defaults", "read", store}), kDone);
  EXPECT_EQ(errors(),
            "twctl: warning: the daemon does not read max_dais of com.orvane.tonewerk.store; did you mean "
            "'max_days'?\n");
  EXPECT_EQ(run({"defaults", "delete", store, "max_dais"}), kDone) << "what is wrong can be taken back";
}

TEST_F(DefaultsCommandTest, ShowsDeviceFactsAndLeavesThemToTheirFile) {
  std::filesystem::create_directories(directory_.path("configuration"));
  write("configuration/device-facts.toml", "InternalBuild = 1\nHapticLeakCaptures = true\n");
  EXPECT_EQ(run({"defaults", "read", "device-facts"}), kDone);
  EXPECT_EQ(output(),
            "key                 from           value\n"
            "InternalBuild       configuration  1\n"
            "HapticLeakCapture   default        false\n"
            "HapticLeakCaptures  configuration  true\n");
  EXPECT_EQ(errors(),
            "twctl: warning: InternalBuild must be true or false, not 1\n"
            "twctl: warning: the daemon does not read HapticLeakCaptures of device-facts; did you mean "
            "'HapticLeakCapture'?\n");
  EXPECT_EQ(run({"defaults", "describe", "device-facts", "InternalBuild"}), kDone);
  EXPECT_THAT(output(), HasSubstr("default false; a change counts: next start\n"));
  const std::string problem = "device facts are not preferences; edit " + directory_.path("configuration") +
                              "/device-facts.toml and reload the daemon";
  expectRefused("device-facts", "InternalBuild", "true", problem);
  EXPECT_EQ(run({"defaults", "delete", "device-facts", "InternalBuild"}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + problem + "\n");
}

// The daemon would ignore these entries, and only log it.
TEST_F(DefaultsCommandTest, RefusesEntriesThatTheDaemonWouldLeaveOut) {
  EXPECT_EQ(
      run({"defaults", "write", "com.orvane.linkreport", "backends", R"(["local", "ftp://a.example"])"}),
      kRefused);
  EXPECT_THAT(errors(),
              HasSubstr("twctl: backends: \"ftp://a.example\" is neither \"local\" nor an address"));
  EXPECT_EQ(run({"defaults", "write", "com.orvane.metricon", "consumers", R"([{name = "a"}])"}), kRefused);
  EXPECT_EQ(errors(), "twctl: consumers: entry 1 (a) has no array of events\n");
  EXPECT_EQ(run({"defaults", "write", "com.orvane.metricon", "consumers", R"([{name = "a", events = []}])"}),
            kDone);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(DefaultsCommandTest, WhatIsTypedForATextIsThatText) {
  for (const char* typed : {"5", "true", "[1]", "Kitchen"}) {
    EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", typed}), kDone);
    EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk", "device_name", "--json"}), kDone);
    EXPECT_THAT(output(), HasSubstr("\"value\":\"" + std::string(typed) + "\"}"));
  }
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "\"quoted\""}), kDone);
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk", "device_name"}), kDone);
  EXPECT_THAT(output(), HasSubstr("  quoted\n"));
}

TEST_F(DefaultsCommandTest, WarnsOfWhatTheDaemonDoesNotReadOrKeepsItself) {
  EXPECT_EQ(run({"defaults", "write", "org.example", "anything", "5"}), kDone);
  EXPECT_EQ(errors(), "twctl: warning: the daemon does not read org.example\n");
  EXPECT_EQ(run({"defaults", "write", "com.orvane.metrikon", "anything", "5"}), kDone);
  EXPECT_EQ(errors(),
            "twctl: warning: the daemon does not read com.orvane.metrikon; did you mean "
            "'com.orvane.metricon'?\n");
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk.twreporting", "VidroInvalidXyIDRlastRun", "5"}),
            kDone);
  EXPECT_EQ(errors(),
            "twctl: warning: the daemon keeps VidroInvalidXyIDRlastRun itself, and will write over it\n");
}

TEST_F(DefaultsCommandTest, ShowsAConfiguredValueThatTheKeyCannotHaveWithAWarning) {
  configure("com.orvane.tonewerk.store", "max_days = \"soon\"\n");
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk.store"}), kDone);
  EXPECT_THAT(output(), HasSubstr("max_days              configuration  soon\n"));
  EXPECT_EQ(errors(), "twctl: warning: max_days must be a number from 1, not \"soon\"\n");
}

TEST_F(DefaultsCommandTest, DescribesThePreferencesThereAre) {
  EXPECT_EQ(run({"defaults", "describe", "com.orvane.tonewerk.store"}), kDone);
  EXPECT_EQ(output(),
            "com.orvane.tonewerk.store\n"
            "  max_megabytes  number from 1, in MiB\n"
            "    MiB that the store takes, its log included\n"
            "    default 256; a change counts: at once\n"
            "  max_days  number from 1, in days\n"
            "    Age of the oldest report in days\n"
            "    default 30; a change counts: at once\n"
            "  journal_megabytes  number from 0, in MiB\n"
            "    MiB of requests kept to outlive a crash\n"
            "    default 64; a change counts: at once\n"
            "  journal_sync_seconds  number from 0 to 3600, in seconds\n"
            "    Seconds until a request is on the disk\n"
            "    default 5; a change counts: at once\n"
            "  journal_days  number from 0, in days\n"
            "    Days that requests are kept for replay\n"
            "    default 0; a change counts: at once\n");
  EXPECT_EQ(run({"defaults", "describe", "com.orvane.linkreport", "event_name_attribute"}), kDone);
  EXPECT_THAT(output(), HasSubstr("    default false; a change counts: next session\n"));
  EXPECT_EQ(run({"defaults", "describe", "com.orvane.tonewerk.captures"}), kDone);
  EXPECT_THAT(output(),
              HasSubstr("    default none; a change counts: at once\n    kept by the daemon itself\n"));
  EXPECT_EQ(run({"defaults", "describe", "com.orvane.tonewerk.store", "max_days", "--json"}), kDone);
  EXPECT_EQ(
      output(),
      R"({"domain":"com.orvane.tonewerk.store","key":"max_days","type":"number from 1","default":30,)"
      R"("keeper":"people","meaning":"Age of the oldest report in days","unit":"days","counts":"at once"})"
      "\n");
  EXPECT_EQ(run({"defaults", "describe"}), kDone);
  EXPECT_THAT(output(),
              testing::AllOf(HasSubstr("\n\ncom.orvane.homedeck\n"), HasSubstr("\n\ndevice-facts\n")));
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

TEST_F(AnnouncedDefaultsTest, NotifiesTheDaemonOfWatchedPreferences) {
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone);
  EXPECT_THAT(posted(), testing::ElementsAre("com.orvane.tonewerk.reporting"));
  EXPECT_EQ(run({"defaults", "delete", "com.orvane.tonewerk", "device_name"}), kDone);
  EXPECT_THAT(posted(), testing::ElementsAre("com.orvane.tonewerk.reporting"));
  EXPECT_EQ(run({"defaults", "write", "com.orvane.homedeck", "spatial-audio-accessory-feature", "1"}), kDone);
  EXPECT_THAT(posted(), testing::ElementsAre("com.orvane.homedeck.spatial-audio-accessory-feature.changed"));
}

TEST_F(AnnouncedDefaultsTest, NotifiesOnlyOfChangedPreferencesThatAreWatched) {
  EXPECT_EQ(run({"defaults", "write", "com.orvane.homedeck", "device_name", "1"}), kRefused);
  EXPECT_EQ(run({"defaults", "write", "com.orvane.linkreport", "device_id", "1"}), kDone);
  EXPECT_EQ(run({"defaults", "read", "com.orvane.homedeck"}), kDone);
  EXPECT_EQ(run({"defaults", "delete", "com.orvane.tonewerk", "device_name"}), kRefused);
  EXPECT_THAT(posted(), IsEmpty());
}

TEST_F(AnnouncedDefaultsTest, NotifiesNothingWithoutARuntimeDirectory) {
  std::filesystem::remove(directory_.path("runtime"));
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone);
  EXPECT_THAT(errors(), IsEmpty());
  EXPECT_FALSE(std::filesystem::exists(directory_.path("runtime")));
}

TEST_F(AnnouncedDefaultsTest, KeepsAChangeThatCannotBeNotifiedAndWarns) {
  write("runtime/notifications", "a file in the way");
  EXPECT_EQ(run({"defaults", "write", "com.orvane.tonewerk", "device_name", "Kitchen"}), kDone);
  EXPECT_THAT(errors(), HasSubstr("a running daemon is not told of it: com.orvane.tonewerk.reporting: "));
  EXPECT_EQ(run({"defaults", "read", "com.orvane.tonewerk", "device_name"}), kDone);
}

}  // namespace
}  // namespace tonewerk

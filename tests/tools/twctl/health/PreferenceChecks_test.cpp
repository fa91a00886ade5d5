// SPDX-License-Identifier: Apache-2.0
#include <string>

#include "tools/twctl/health/CheckupTest.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

class PreferenceChecksTest : public CheckupTest {
 protected:
  void configure(const std::string& domain, const std::string& text) {
    write("configuration/preferences/" + domain + ".toml", text);
  }
  void writeState(const std::string& domain, const std::string& text) {
    write("state/preferences/" + domain + ".toml", text);
  }
};

TEST_F(PreferenceChecksTest, FindNothingInFilesThatFitTheSchema) {
  configure("com.orvane.tonewerk.store", "max_days = 5\n");
  writeState("com.orvane.tonewerk.captures", "accepted = {count = 1, day = \"2026-11-20\"}\n");
  configure("org.example.player", "anything = 1\n");
  write("configuration/device-facts.toml", "HapticLeakCapture = true\n");
  EXPECT_THAT(find(checkPreferences), IsEmpty());
  EXPECT_THAT(find(checkFacts), IsEmpty());
  EXPECT_THAT(find(checkEndpoints), IsEmpty());
  EXPECT_THAT(unseen, IsEmpty());
}

TEST_F(PreferenceChecksTest, FindAFileThatDoesNotParse) {
  configure("com.orvane.tonewerk.store", "max_days = \n");
  EXPECT_THAT(find(checkPreferences), ElementsAre(AllOf(StartsWith("broken-file: "),
                                                        HasSubstr("com.orvane.tonewerk.store.toml:1:"))));
  EXPECT_THAT(remedies, ElementsAre(StartsWith("mend the line in ")));
}

TEST_F(PreferenceChecksTest, FindAKeyThatTheDaemonDoesNotRead) {
  configure("com.orvane.tonewerk.store", "max_dais = 5\n");
  writeState("com.orvane.linkreport", "device = \"x\"\n");
  EXPECT_THAT(
      find(checkPreferences),
      ElementsAre(EndsWith("the daemon does not read max_dais of com.orvane.tonewerk.store; did you mean "
                           "'max_days'?"),
                  StartsWith("unknown-key: ")));
  EXPECT_EQ(remedies[1], "twctl defaults delete com.orvane.linkreport device");
  EXPECT_THAT(remedies[0], StartsWith("edit or remove max_dais in "));
}

// A remedy is there to be copied into a shell.
TEST_F(PreferenceChecksTest, RemediesQuoteNamesForTheShell) {
  writeState("com.orvane.linkreport", "\"$(id) x\" = 1\nbackends = [\"https://host.example/a?b&c\"]\n");
  (void)find(checkPreferences);
  EXPECT_EQ(remedies.at(0), "twctl defaults delete com.orvane.linkreport '$(id) x'");
  unreachable = "no route";
  checkup.daemon.endpoints = ValueArray{ValueMap{{"name", "https://host.example/a&b"}, {"problem", "404"}}};
  (void)find(checkEndpoints);
  EXPECT_EQ(remedies.back(), "curl -v 'https://host.example/a&b'");
}

TEST_F(PreferenceChecksTest, FindAValueThatTheKeyCannotHave) {
  writeState("com.orvane.tonewerk.store", "max_days = \"soon\"\n");
  EXPECT_THAT(find(checkPreferences),
              ElementsAre(EndsWith("max_days must be a number from 1, not \"soon\"")));
  EXPECT_THAT(remedies,
              ElementsAre("twctl defaults write com.orvane.tonewerk.store max_days 30, or edit the file"));
  checkup.isSystemWide = true;
  (void)find(checkPreferences);
  EXPECT_THAT(remedies, ElementsAre(StartsWith("sudo twctl --system defaults write ")));
}

TEST_F(PreferenceChecksTest, FindAFileWhoseNameIsNearlyThatOfADomain) {
  configure("com.orvane.tonewerk.stor", "max_days = 5\n");
  EXPECT_THAT(find(checkPreferences),
              ElementsAre(AllOf(StartsWith("unknown-domain: "),
                                EndsWith("is not read; did you mean com.orvane.tonewerk.store?"))));
  EXPECT_THAT(remedies, ElementsAre(HasSubstr("/preferences/com.orvane.tonewerk.store.toml")));
}

TEST_F(PreferenceChecksTest, FindAFileThatTheDaemonsUserCannotRead) {
  configure("com.orvane.tonewerk.store", "max_days = 5\n");
  allow("configuration/preferences/com.orvane.tonewerk.store.toml", 0600);
  checkup.daemon.daemon.set("user", 3'999'999);
  if (::geteuid() != 0) checkup.daemon.daemon.set("user", ::geteuid() + 1);
  EXPECT_THAT(find(checkPreferences), ElementsAre(StartsWith("unreadable-file: ")));
}

TEST_F(PreferenceChecksTest, FindThatNoEventIsAskedFor) {
  configure("com.orvane.metricon", "[[consumers]]\nname = \"a\"\nevents = []\n");
  EXPECT_THAT(find(checkPreferences), ElementsAre(StartsWith("no-consumer: ")));
  writeState("com.orvane.metricon", "consumers = [{name = \"a\", events = [\"*\"]}]\n");
  EXPECT_THAT(find(checkPreferences), IsEmpty()) << "what was written counts";
}

// `defaults delete` removes only what `defaults write` has written.
TEST_F(PreferenceChecksTest, SendNobodyToDeleteWhatAFileOfTheConfigurationSays) {
  configure("com.orvane.metricon", "consumers = []\n");
  configure("com.orvane.linkreport", "backends = [\"ftp://a.example\"]\n");
  (void)find(checkPreferences);
  EXPECT_THAT(remedies, ElementsAre(StartsWith("edit or remove backends in "),
                                    StartsWith("edit or remove consumers in ")));
  configure("com.orvane.metricon", "");
  configure("com.orvane.linkreport", "");
  writeState("com.orvane.metricon", "consumers = []\n");
  writeState("com.orvane.linkreport", "backends = [\"ftp://a.example\"]\n");
  (void)find(checkPreferences);
  EXPECT_THAT(remedies, ElementsAre("twctl defaults delete com.orvane.linkreport backends, or edit the file",
                                    "twctl defaults delete com.orvane.metricon consumers"));
}

TEST_F(PreferenceChecksTest, FindFactsThatTheDaemonCannotUse) {
  write("configuration/device-facts.toml", "InternalBild = true\nHapticLeakCapture = 1\n");
  EXPECT_THAT(find(checkFacts), ElementsAre(StartsWith("wrong-fact: "), StartsWith("wrong-fact: ")));
}

TEST_F(PreferenceChecksTest, FindAFactThatNeedsARestart) {
  write("configuration/device-facts.toml", "InternalBuild = true\n");
  EXPECT_THAT(find(checkFacts),
              ElementsAre("old-fact: InternalBuild is true now, and was not when the daemon started"));
  checkup.daemon.daemon.set("internalBuild", true);
  EXPECT_THAT(find(checkFacts), IsEmpty());
}

TEST_F(PreferenceChecksTest, FindAnEndpointThatIsNoAddress) {
  configure("com.orvane.linkreport", "backends = [\"local\", \"ftp://a.example\"]\n");
  EXPECT_THAT(find(checkPreferences), ElementsAre(StartsWith("wrong-endpoint: ")));
  configure("com.orvane.linkreport", "backends = \"local\"\n");
  EXPECT_THAT(find(checkPreferences), ElementsAre(StartsWith("wrong-value: ")));
}

TEST_F(PreferenceChecksTest, FindAnEndpointThatCannotBeReached) {
  configure("com.orvane.linkreport", R"(backends = ["https://a.example", "http://[::1]:4318/base"])");
  EXPECT_THAT(find(checkEndpoints), IsEmpty());
  EXPECT_THAT(reached, ElementsAre("a.example 443", "::1 4318"));
  unreachable = "Connection refused";
  EXPECT_THAT(find(checkEndpoints), ElementsAre("unreachable-endpoint: https://a.example: Connection refused",
                                                StartsWith("unreachable-endpoint: http://[::1]:4318/base")));
}

TEST_F(PreferenceChecksTest, FindAnEndpointToWhichTheDaemonCannotSend) {
  checkup.daemon.endpoints =
      ValueArray{ValueMap{{"name", "http://a.example/v1/logs"}, {"problem", ""}},
                 ValueMap{{"name", "http://b.example/v1/logs"}, {"problem", "HTTP status 503"}}};
  EXPECT_THAT(find(checkEndpoints),
              ElementsAre("failing-endpoint: http://b.example/v1/logs: HTTP status 503"));
}

}  // namespace
}  // namespace tonewerk

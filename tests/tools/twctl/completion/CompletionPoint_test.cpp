// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/completion/CompletionPoint.h"

#include <CLI/CLI.hpp>
#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using Kind = CompletionPoint::Kind;
using testing::ElementsAre;
using testing::IsEmpty;

class CompletionPointTest : public testing::Test {
 protected:
  CompletionPointTest() {
    app.add_flag("--system");
    CLI::App* top = app.add_subcommand("top", "What happens");
    top->add_option("-n,--limit", number, "How many");
    top->add_option("--watch", text, "Again")->expected(0, 1);
    CLI::App* defaults = app.add_subcommand("defaults", "Preferences");
    CLI::App* read = defaults->add_subcommand("read", "Reads");
    read->add_option("DOMAIN", text, "Where");
    read->add_option("KEY", text, "Which");
    defaults->add_subcommand("remove", "Removes")->add_option("ID", texts, "What");
    CLI::App* shows = app.add_subcommand("export", "Writes");
    shows->add_option("--format", text, "How")->type_name("csv|jsonl");
    CLI::App* sandbox = app.add_subcommand("sandbox", "Runs");
    sandbox->prefix_command();
    sandbox->add_flag("--keep");
    app.add_subcommand("secret", "Not for people")->group("");
  }

  CompletionPoint at(const std::vector<std::string>& words) const { return completionPointOf(app, words); }
  std::vector<std::string> offered(const std::vector<std::string>& words) const {
    std::vector<std::string> found;
    for (const Candidate& candidate : candidatesOfTree(at(words))) found.push_back(candidate.word);
    return found;
  }

  CLI::App app{"A tool", "tool"};
  int number = 0;
  std::string text;
  std::vector<std::string> texts;
};

TEST_F(CompletionPointTest, OffersCommandsThatAreNotHidden) {
  EXPECT_THAT(offered({""}), ElementsAre("top", "defaults", "export", "sandbox"));
  EXPECT_THAT(offered({}), ElementsAre("top", "defaults", "export", "sandbox"));
  EXPECT_THAT(offered({"--system", "defaults", "re"}), ElementsAre("read", "remove"));
  EXPECT_THAT(offered({"secret", ""}), IsEmpty());
  EXPECT_THAT(offered({"nonsense", ""}), IsEmpty());
}

TEST_F(CompletionPointTest, OffersTheOptionsOfTheCommandWithTheirDescriptions) {
  EXPECT_THAT(offered({"top", "-"}), ElementsAre("--help", "--limit", "--watch"));
  EXPECT_THAT(offered({"top", "--li"}), ElementsAre("--limit"));
  EXPECT_EQ(candidatesOfTree(at({"top", "--li"})).at(0).description, "How many");
}

TEST_F(CompletionPointTest, AnOptionTakesTheNextWordAsItsValue) {
  for (const char* option : {"-n", "--limit"}) {
    const CompletionPoint point = at({"top", option, "1"});
    EXPECT_EQ(point.kind, Kind::kValue);
    EXPECT_TRUE(point.option->check_name("--limit"));
    EXPECT_EQ(point.word, "1");
  }
  EXPECT_THAT(offered({"top", "--limit", "5", "--wa"}), ElementsAre("--watch"));
}

TEST_F(CompletionPointTest, AValueThatMayBeLeftOutIsLeftOutBeforeAnotherOption) {
  EXPECT_EQ(at({"top", "--watch", ""}).kind, Kind::kValue);
  EXPECT_THAT(offered({"top", "--watch", "--li"}), ElementsAre("--limit"));
}

TEST_F(CompletionPointTest, OffersTheChoicesOfAType) {
  EXPECT_THAT(offered({"export", "--format", ""}), ElementsAre("csv", "jsonl"));
  EXPECT_THAT(offered({"export", "--format", "j"}), ElementsAre("jsonl"));
  EXPECT_THAT(offered({"export", "--format=j"}), ElementsAre("--format=jsonl"));
  EXPECT_THAT(offered({"export", "--nonsense=j"}), IsEmpty());
}

TEST_F(CompletionPointTest, CountsArguments) {
  const CompletionPoint point = at({"defaults", "read", "com.example", "k"});
  EXPECT_EQ(point.kind, Kind::kArgument);
  EXPECT_EQ(point.option->get_name(true), "KEY");
  EXPECT_EQ(point.path, "defaults read");
  EXPECT_THAT(point.arguments, ElementsAre("com.example"));
  EXPECT_EQ(at({"defaults", "read", "a", "b", ""}).kind, Kind::kNothing);
  EXPECT_EQ(at({"defaults", "remove", "a", "b", ""}).option->get_name(true), "ID");
  EXPECT_EQ(at({"defaults", "read", "--", "-x"}).kind, Kind::kArgument);
}

TEST_F(CompletionPointTest, KnowsWhereAnotherProgramBegins) {
  const auto foreignAt = [&](const std::vector<std::string>& words) {
    const CompletionPoint point = at(words);
    return point.kind == Kind::kForeign ? static_cast<int>(point.foreignAt) : -1;
  };
  EXPECT_EQ(foreignAt({"sandbox", ""}), 1);
  EXPECT_EQ(foreignAt({"--system", "sandbox", "--keep", "./player", "--keep"}), 3);
  EXPECT_EQ(foreignAt({"sandbox", "--", "--odd", "x"}), 2);
  EXPECT_EQ(foreignAt({"sandbox", "--", ""}), 2);
  EXPECT_THAT(offered({"sandbox", "--k"}), ElementsAre("--keep"));
}

TEST_F(CompletionPointTest, FindsTheCommandLineOfAnotherProgram) {
  EXPECT_EQ(foreignCommandIn(app, {"sandbox", "--keep", "./player", "--keep"}), 2U);
  EXPECT_EQ(foreignCommandIn(app, {"--system", "sandbox", "--", "--", "x"}), 3U);
  EXPECT_EQ(foreignCommandIn(app, {"sandbox"}), std::nullopt);
  EXPECT_EQ(foreignCommandIn(app, {"sandbox", "--"}), std::nullopt);
  EXPECT_EQ(foreignCommandIn(app, {"defaults", "read", "--", "sandbox", "x"}), std::nullopt);
  EXPECT_EQ(foreignCommandIn(app, {}), std::nullopt);
}

TEST_F(CompletionPointTest, KnowsWhoseDaemonIsMeant) {
  EXPECT_TRUE(at({"--system", "top", ""}).systemWide);
  EXPECT_FALSE(at({"top", ""}).systemWide);
}

}  // namespace
}  // namespace tonewerk

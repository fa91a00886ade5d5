// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <gmock/gmock.h>
#include <stdlib.h>
#include <string>
#include <sys/stat.h>

#include "platform/linux/files/TextFile.h"
#include "support/reports/ReportViews.h"
#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

// Runs twctl with a store and without a journal.
class SessionCommandTest : public CommandLineTest {
 protected:
  SessionCommandTest() {
    std::filesystem::create_directories(directory_.path("state"));
    ReportViews views(directory_.path("state") + "/reports.db");
    views.played(2, "Melody\x1b[31m", 1'795'132'800.0, 3600.0, "Speaker", 0.5);
    views.overloaded(2, 1'795'132'810.0, 256);
    views.run(
        "INSERT INTO event VALUES (1, 1795132800.0, 2, 'Playback', 'Start', 'client', '{}'), "
        "(7, 1795136400.0, 2, 'Volume', 'Summary', 'derived', "
        "'{\"msgidx\":1}'), (8, 1795136400.0, NULL, 'Volume', 'Generic', 'client', '{}')");
  }
};

TEST_F(SessionCommandTest, TellsWhatTheStoreKnowsWithoutAJournal) {
  EXPECT_EQ(run({"session", "2"}), kDone) << errors();
  EXPECT_THAT(output(),
              StartsWith("Session 2: Melody\\u001b[31m (process player, user 1000) for longformaudio, "
                         "reporter 1002.\n"
                         "It began at 2026-11-20 00:00:00Z and ended at 2026-11-20 01:00:00Z, after "
                         "1:00:00: it was stopped.\n"
                         "10 messages, 2 of them redundant; 0 overloads; 3600 s active.\n"));
  EXPECT_THAT(output(), HasSubstr("The reasons are not known: there is no journal.\n"));
  EXPECT_THAT(output(), HasSubstr("  1  Volume Summary (derived)\n"));
  EXPECT_THAT(output(), HasSubstr("+0 s to +3600 s, 3600 s  Volume on Speaker at volume 0.5 (event 2)\n"));
  EXPECT_THAT(output(), HasSubstr("+10 s  overload at mixer, 0.5 s of silence, buffer of 256 frames"));
}

TEST_F(SessionCommandTest, TellsWhoseAnOverloadWasAndTheTraceHasItsCycles) {
  {
    ReportViews views(directory_.path("glitch.db"));
    views.played(2, "Melody", 1'795'132'800.0, 3600.0, "Speaker", 0.5);
    views.overloaded(2, 1'795'132'810.0, 256);
    views.glitched(
        {.event = 1,
         .session = 2,
         .at = 1'795'132'809.0,
         .id = "1795132809000-7",
         .cause = "waiting for another",
         .application = "Studio",
         .process = "studio",
         .cycles = R"([{"begin":0,"period":5000,"nodes":[{"name":"studio","signal":0,"finish":8000}]}])"});
  }
  std::filesystem::rename(directory_.path("glitch.db"), directory_.path("state") + "/reports.db");
  EXPECT_EQ(run({"session", "2"}), kDone) << errors();
  EXPECT_THAT(
      output(),
      HasSubstr("  +10 s  overload at mixer, 0.5 s of silence, buffer of 256 frames; it waited for "
                "another, which was first in the chain: late, culprit Studio (studio, 4711), at least "
                "3 ms beyond the deadline, 5 ms lost (event 1; `twctl glitches --why 1` tells more)\n"));
  EXPECT_EQ(run({"session", "2", "--json"}), kDone) << errors();
  EXPECT_THAT(output(),
              HasSubstr(R"("seconds":0.5,"glitch_id":"1795132809000-7","cause":"waiting for another",)"
                        R"x("first_cause":"late","culprit":"Studio (studio, 4711)","over_ms":3.0,)x"));
  const std::string trace = directory_.path("trace.json");
  EXPECT_EQ(run({"trace", "--session", "2", "-o", trace}), kDone) << errors();
  std::string text;
  ASSERT_FALSE(readTextFile(trace, text));
  EXPECT_THAT(text, AllOf(HasSubstr("\"the glitch's cycle\""), HasSubstr("\"glitch: late\"")));
}

TEST_F(SessionCommandTest, GivesProgramsAnObjectALine) {
  EXPECT_EQ(run({"session", "2", "--json"}), kDone);
  EXPECT_THAT(output(), StartsWith(R"({"id":2,"reporter_id":1002,)"));
  EXPECT_THAT(output(), HasSubstr("\n{\"what\":\"unknown\",\"why\":\"there is no journal\"}\n"));
  EXPECT_THAT(output(), HasSubstr(R"({"what":"issue","event":1,"at":1795132810.0,"kind":"overload")"));
}

TEST_F(SessionCommandTest, SaysWhichSessionIsNotThere) {
  EXPECT_EQ(run({"session", "12"}), kRefused);
  EXPECT_EQ(errors(), "twctl: the store has no session 12; `twctl sessions` lists those that there are\n");
  EXPECT_EQ(run({"session", "1002"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the reporter identifier 1002 is that of these sessions, newest first: 2"));
  EXPECT_EQ(run({"explain", "--session", "12", "--missing", "volume"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the store has no session 12"));
  EXPECT_THAT(output(), IsEmpty());
}

TEST_F(SessionCommandTest, SaysWhichEventIsNotThere) {
  EXPECT_EQ(run({"explain", "12"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the store has no event 12; it has events from 1 to 8; `twctl sql"));
  EXPECT_EQ(run({"explain", "8"}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("event 8 belongs to no session"));
}

TEST_F(SessionCommandTest, ExplainsWhatItCanAndFails) {
  EXPECT_EQ(run({"explain", "7"}), kRefused);
  EXPECT_EQ(output(),
            "Event 7: Volume Summary of session 2, recorded at 2026-11-20 01:00:00Z, made by the daemon.\n"
            "The reasons are not known: there is no journal.\n");
}

TEST_F(SessionCommandTest, ExplainsOneThingAtATime) {
  EXPECT_EQ(run({"explain"}), kWrongUsage);
  EXPECT_EQ(run({"explain", "7", "--session", "2"}), kWrongUsage);
  EXPECT_EQ(run({"explain", "7", "--missing", "volume"}), kWrongUsage);
  EXPECT_EQ(run({"explain", "--session", "2"}), kWrongUsage);
  EXPECT_EQ(run({"explain", "--session", "2", "--missing", "volme"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("did you mean 'volume'?"));
}

class TraceCommandTest : public SessionCommandTest {
 protected:
  TraceCommandTest() {
    setenv("LOGS_DIRECTORY", directory_.path("logs").c_str(), 1);
    std::filesystem::create_directories(directory_.path("logs/Audio/Traces"));
  }
  void TearDown() override {
    unsetenv("LOGS_DIRECTORY");
    SessionCommandTest::TearDown();
  }

  // Writes the benchmark data file of a session's trace.
  std::string traced(const std::string& name, const std::string& reporter, const std::string& entries) {
    return write(name,
                 "{\"context\":{\"reporter_id\":" + reporter + "},\n\"benchmarks\":[\n" + entries + "\n]}\n");
  }
  std::string textOf(const std::string& file) const {
    std::string text;
    EXPECT_FALSE(readTextFile(file, text));
    return text;
  }
};

TEST_F(TraceCommandTest, MakesAFileThatOnlyItsOwnerMayRead) {
  const std::string file = directory_.path("trace.json");
  EXPECT_EQ(run({"trace", "--session", "2", "-o", file}), kDone) << errors();
  std::string text;
  ASSERT_FALSE(readTextFile(file, text));
  EXPECT_THAT(text, HasSubstr(R"("name":"Speaker")"));
  EXPECT_THAT(text, testing::EndsWith("]}\n"));
  struct stat status {};
  ASSERT_EQ(stat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777U, 0600U);
}

TEST_F(TraceCommandTest, MakesNoFileForASessionThatIsNotThere) {
  const std::string file = directory_.path("trace.json");
  EXPECT_EQ(run({"trace", "--session", "12", "-o", file}), kRefused);
  EXPECT_THAT(errors(), HasSubstr("the store has no session 12"));
  EXPECT_FALSE(std::filesystem::exists(file));
}

TEST_F(TraceCommandTest, HasTheSignpostsOfTheSession) {
  (void)traced("logs/Audio/Traces/1.bdj", "1002", R"({"name":"decode","real_time":1.5,"begin":1795132801})");
  (void)traced("logs/Audio/Traces/2.bdj", "1002", R"({"name":"mix","real_time":1.5,"begin":1795132802})");
  (void)traced("logs/Audio/Traces/3.bdj", "1003", R"({"name":"other's","real_time":1.5,"begin":1795132801})");
  (void)traced("logs/Audio/Traces/4.txt", "1002", R"({"name":"text","real_time":1.5,"begin":1795132801})");
  std::filesystem::create_directory(directory_.path("logs/Audio/Traces/5.bdj"));
  const std::string file = directory_.path("trace.json");
  EXPECT_EQ(run({"trace", "--session", "2", "-o", file}), kDone) << errors();
  EXPECT_THAT(errors(), IsEmpty());
  EXPECT_THAT(textOf(file),
              AllOf(HasSubstr(R"("name":"decode","cat":"signpost")"), HasSubstr(R"("name":"mix")")));
  EXPECT_THAT(textOf(file), AllOf(Not(HasSubstr("other's")), Not(HasSubstr("\"text\""))));
}

TEST_F(TraceCommandTest, TakesSignpostsFromAFileElsewhereWhosesoeverItIs) {
  const std::string signposts =
      traced("my.bdj", "9", R"({"name":"decode","real_time":1.5,"begin":1795132801})");
  const std::string file = directory_.path("trace.json");
  EXPECT_EQ(run({"trace", "--session", "2", "--signposts", signposts, "-o", file}), kDone) << errors();
  EXPECT_THAT(textOf(file), HasSubstr(R"("name":"decode","cat":"signpost")"));
}

TEST_F(TraceCommandTest, SaysWhyAFileGivesNoSignposts) {
  const std::string file = directory_.path("trace.json");
  const auto problemWith = [&](const std::string& signposts) {
    EXPECT_EQ(run({"trace", "--session", "2", "--signposts", signposts, "-o", file}), kRefused);
    EXPECT_FALSE(std::filesystem::exists(file));
    return errors();
  };
  EXPECT_THAT(problemWith(directory_.path("none.bdj")), HasSubstr("none.bdj: it is no file\n"));
  EXPECT_THAT(problemWith("/dev/zero"), HasSubstr("it is no file\n"));
  EXPECT_THAT(problemWith(write("a.bdj", "noise")), HasSubstr("it is no benchmark data file"));
  EXPECT_THAT(problemWith(traced("b.bdj", "1002", R"({"name":"decode","real_time":1.5})")),
              HasSubstr("it does not say when its intervals began"));
  EXPECT_THAT(problemWith(traced("c.bdj", "1002", R"({"name":"decode","real_time":1.5,"begin":1})")),
              HasSubstr("none of its intervals began while the session was there"));
}

TEST_F(TraceCommandTest, LeavesAFileThatExistsAsItIs) {
  const std::string file = write("trace.json", "mine");
  EXPECT_EQ(run({"trace", "--session", "2", "-o", file}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + file + ": it exists already\n");
  std::string text;
  ASSERT_FALSE(readTextFile(file, text));
  EXPECT_EQ(text, "mine");
}

}  // namespace
}  // namespace tonewerk

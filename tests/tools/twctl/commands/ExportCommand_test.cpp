// SPDX-License-Identifier: Apache-2.0
#include <csignal>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/store/FullDisk.h"
#include "tools/twctl/CommandLineTest.h"
#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

// Runs twctl with a store that has three events.
class ExportCommandTest : public CommandLineTest {
 protected:
  ExportCommandTest() {
    setenv("STATE_DIRECTORY", fixture.state().c_str(), 1);
    fixture.run(
        "CREATE TABLE event_row (id INTEGER PRIMARY KEY, at REAL, payload TEXT);"
        "INSERT INTO event_row VALUES (1, 1763633880.25, '{\"a\": 1.0}'), (2, 1763633940, NULL), (3, NULL, "
        "'{}');"
        "CREATE VIEW event AS SELECT * FROM event_row; CREATE VIEW names AS SELECT 'a' AS name;");
    std::filesystem::create_directory(made_);
  }
  static std::string textOf(const std::string& file) {
    std::ifstream text(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(text), {}};
  }
  std::vector<std::string> made() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(made_))
      names.push_back(entry.path().filename());
    return names;
  }

  StoreFixture fixture;
  const std::string made_ = directory_.path("made");
  const std::string file_ = made_ + "/event.out";
};

TEST_F(ExportCommandTest, WritesCsvWithAHeader) {
  EXPECT_EQ(run({"export", "--format", "csv", "event"}), kDone);
  EXPECT_EQ(output(), "id,at,payload\r\n1,1763633880.25,\"{\"\"a\"\": 1.0}\"\r\n2,1763633940,\r\n3,,{}\r\n");
}

TEST_F(ExportCommandTest, WritesJsonLinesWithThePayloadAsJson) {
  EXPECT_EQ(run({"export", "--format", "jsonl", "EVENT"}), kDone);
  EXPECT_EQ(output(),
            "{\"id\":1,\"at\":1763633880.25,\"payload\":{\"a\":1.0}}\n"
            "{\"id\":2,\"at\":1763633940.0,\"payload\":null}\n"
            "{\"id\":3,\"at\":null,\"payload\":{}}\n");
}

TEST_F(ExportCommandTest, WritesTheRowsOfATime) {
  EXPECT_EQ(run({"export", "--format", "csv", "event", "--since", "2025-11-20T10:18:01Z"}), kDone);
  EXPECT_EQ(output(), "id,at,payload\r\n2,1763633940,\r\n");
  EXPECT_EQ(run({"export", "--format", "csv", "event", "--until", "2025-11-20T10:18:01Z"}), kDone);
  EXPECT_THAT(output(), HasSubstr("\r\n1,1763633880.25,"));
  EXPECT_EQ(run({"export", "--format", "csv", "event", "--since", "2025-11-20T10:18:00.25Z", "--until",
                 "2025-11-20T10:18:00.25Z"}),
            kDone);
  EXPECT_THAT(output(), HasSubstr("\r\n1,1763633880.25,"));
  EXPECT_EQ(run({"export", "--format", "csv", "names", "--since", "1h"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: names has no time, so --since and --until do not apply\n");
  EXPECT_EQ(run({"export", "--format", "csv", "event", "--since", "then"}), kWrongUsage);
  EXPECT_EQ(
      errors(),
      "twctl: --since: \"then\" is neither a time, as 2026-11-20 or \"2026-11-20 10:18\", nor how long ago, "
      "as 10m or \"1 hour ago\"\n");
}

TEST_F(ExportCommandTest, RefusesARangeThatEndsBeforeItBegins) {
  EXPECT_EQ(run({"export", "--format", "csv", "event", "--since", "1h", "--until", "2h"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: --since: \"1h\" is later than --until, \"2h\"\n");
  EXPECT_EQ(output(), "");
}

TEST_F(ExportCommandTest, NamesTheNearestViewAndAllOthers) {
  EXPECT_EQ(run({"export", "--format", "csv", "evnt"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: unknown view 'evnt'; did you mean 'event'? There are event and names\n");
  EXPECT_EQ(run({"export", "--format", "csv", "something"}), kWrongUsage);
  EXPECT_EQ(errors(), "twctl: unknown view 'something'; there are event and names\n");
  EXPECT_EQ(run({"export", "--format", "csv", "x\"; DROP TABLE event_row; --"}), kWrongUsage);
  EXPECT_EQ(run({"export", "--format", "csv", "event_row"}), kDone);  // a table can be exported, too
}

TEST_F(ExportCommandTest, NeedsAFormatThatItKnows) {
  EXPECT_EQ(run({"export", "event"}), kWrongUsage);
  EXPECT_EQ(run({"export", "--format", "xml", "event"}), kWrongUsage);
  EXPECT_THAT(errors(), HasSubstr("'xml' is no format; there are csv and jsonl"));
  EXPECT_EQ(run({"export", "--format", "csv"}), kWrongUsage);
}

TEST_F(ExportCommandTest, MakesAFileThatOnlyItsOwnerReads) {
  EXPECT_EQ(run({"export", "--format", "csv", "event", "-o", file_}), kDone) << errors();
  EXPECT_EQ(output(), "rows\n3\n");
  EXPECT_THAT(textOf(file_), HasSubstr("\r\n3,,{}\r\n"));
  EXPECT_EQ(std::filesystem::status(file_).permissions(), std::filesystem::perms{0600});
  EXPECT_THAT(made(), ElementsAre("event.out"));
}

TEST_F(ExportCommandTest, ReplacesNoFile) {
  std::ofstream(file_) << "text";
  EXPECT_EQ(run({"export", "--format", "csv", "event", "--output", file_}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + file_ + ": it exists already\n");
  EXPECT_EQ(textOf(file_), "text");
}

TEST_F(ExportCommandTest, AFullDiskLeavesNothingBehind) {
  {
    const FullDisk full(20);
    EXPECT_EQ(run({"export", "--format", "csv", "event", "-o", file_}), kRefused);
  }
  EXPECT_EQ(errors(), "twctl: " + file_ + ": File too large\n");
  EXPECT_THAT(made(), IsEmpty());
}

TEST_F(ExportCommandTest, ARowThatCannotBeReadLeavesNothingBehind) {
  fixture.run("CREATE VIEW wrong AS SELECT at FROM event_row UNION ALL SELECT json('{')");
  EXPECT_EQ(run({"export", "--format", "csv", "wrong", "-o", file_}), kRefused);
  EXPECT_EQ(errors(), "twctl: " + file_ + ": malformed JSON\n");
  EXPECT_THAT(made(), IsEmpty());
}

TEST_F(ExportCommandTest, ControlCLeavesNothingBehind) {
  fixture.run(
      "CREATE VIEW endless AS WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n) "
      "SELECT i FROM n WHERE i < 3 OR i < 0");
  std::thread user([] {
    // The signal would end the test before the command listens to it.
    struct sigaction action {};
    do {
      std::this_thread::yield();
      sigaction(SIGINT, nullptr, &action);
    } while (action.sa_handler == SIG_DFL);
    kill(getpid(), SIGINT);
  });
  EXPECT_EQ(run({"export", "--format", "csv", "endless", "-o", file_}), kRefused);
  user.join();
  EXPECT_EQ(errors(), "twctl: " + file_ + ": interrupted\n");
  EXPECT_THAT(made(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk

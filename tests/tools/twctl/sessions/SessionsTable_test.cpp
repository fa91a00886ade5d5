// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionsTable.h"

#include <gtest/gtest.h>
#include <sstream>
#include <string>

#include "support/ScopedTimeZone.h"
namespace tonewerk {
namespace {

constexpr double kBegin = 1'763'633'880.25;  // 2025-11-20T10:18:00.25Z

StoredSession player() {
  return {.id = 41,
          .reporterID = 7,
          .service = "longformaudio",
          .application = "org.example.Player",
          .process = "player",
          .user = 1000,
          .startedAt = kBegin,
          .endedAt = kBegin + 3723.0,
          .ending = "stopped",
          .messages = 120,
          .redundantMessages = 14,
          .activeSeconds = 3600.0,
          .overloads = 2};
}

StoredSession running() { return {.id = 42, .reporterID = -8, .user = 1001, .startedAt = kBegin + 10.0}; }

std::string tableOf(std::size_t width) {
  const ScopedTimeZone zone("UTC0");
  std::ostringstream out;
  {
    SessionsTable table(out, false, kBegin + 100.0, width);
    table.add(player());
    table.add(running());
  }
  return out.str();
}

TEST(SessionsTableTest, HasAllColumnsWhereThereIsRoom) {
  EXPECT_EQ(
      tableOf(200),
      "id  began                 length   application         service        ending   messages  redundant  "
      "overloads  reporter\n"
      "41  2025-11-20 10:18:00Z  1:02:03  org.example.Player  longformaudio  stopped  120       14         "
      "2          7\n"
      "42  2025-11-20 10:18:10Z  1:30     -                   -              running  -         -          "
      "-          -8\n");
}

TEST(SessionsTableTest, KeepsTheImportantColumnsInANarrowTerminal) {
  EXPECT_EQ(tableOf(60),
            "id  began                 length   application\n"
            "41  2025-11-20 10:18:00Z  1:02:03  org.example.Player\n"
            "42  2025-11-20 10:18:10Z  1:30     -\n");
}

TEST(SessionsTableTest, GivesProgramsTheNamesOfTheView) {
  std::ostringstream out;
  {
    SessionsTable table(out, true, kBegin + 100.0, 60);
    table.add(player());
    table.add(running());
  }
  EXPECT_EQ(out.str(),
            R"({"id":41,"reporter_id":7,"service":"longformaudio","application":"org.example.Player",)"
            R"("process":"player","user_id":1000,"started_at":1763633880.25,"ended_at":1763637603.25,)"
            R"("seconds":3723.0,"ending":"stopped","messages":120,"redundant_messages":14,"overloads":2})"
            "\n"
            R"({"id":42,"reporter_id":-8,"service":null,"application":null,"process":null,"user_id":1001,)"
            R"("started_at":1763633890.25,"ended_at":null,"seconds":90.0,"ending":null,"messages":null,)"
            R"("redundant_messages":null,"overloads":null})"
            "\n");
}

}  // namespace
}  // namespace tonewerk

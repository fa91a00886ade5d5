// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedTimeZone.h"
#include "support/TemporaryDirectory.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/show/DiagnosticSummary.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::ContainsRegex;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

constexpr const char* kCaptureRequest =
    R"({"signature": {"domain": "AudioAnalytics", "type": "alarms", "subType": "Error",
  "subtypeContext": "IssueDetector", "detectedProcess": "alarmd"}, "duration": 60.0, "payload": {"key": [1, null]},
  "requestedAt": "2026-11-20T10:18:00Z", "collected": ["load.txt"],
  "problems": {"pipewire.json": "pw-dump: ended with status 1"}})";

// Runs twctl with its own state directory.
class DiagnosticsCommandTest : public testing::Test {
 protected:
  const ScopedTimeZone zone{"UTC0"};
  DiagnosticsCommandTest() { setenv("STATE_DIRECTORY", directory.path("state").c_str(), 1); }
  void TearDown() override { unsetenv("STATE_DIRECTORY"); }

  void put(DiagnosticKind kind, const std::string& name, const std::string& request, int ageSeconds = 0) {
    ASSERT_FALSE(items.write(kind, name, {{"request.json", request}, {"load.txt", "0.5\n"}}));
    std::filesystem::last_write_time(items.pathOf(kind, name), std::filesystem::file_time_type::clock::now() -
                                                                   std::chrono::seconds(ageSeconds));
  }

  int run(std::vector<std::string> arguments) {
    std::vector<const char*> argv{"twctl"};
    for (const std::string& argument : arguments) argv.push_back(argument.c_str());
    out.str({});
    err.str({});
    Tool tool{out, err, json};
    return runCommandLine(static_cast<int>(argv.size()), argv.data(), tool);
  }

  TemporaryDirectory directory;
  DiagnosticsDirectory items{directory.path("state")};
  NlohmannJsonService json;
  std::ostringstream out;
  std::ostringstream err;
};

TEST_F(DiagnosticsCommandTest, ListsNothingWhereNothingIs) {
  for (const char* command : {"captures", "drafts", "whirlcaps"}) {
    EXPECT_EQ(run({command}), kDone);
    EXPECT_THAT(out.str(), IsEmpty());
    EXPECT_THAT(err.str(), IsEmpty());
  }
}

TEST_F(DiagnosticsCommandTest, ListsThoseOfATimeAndTheNewestSoMany) {
  put(DiagnosticKind::kCapture, "known", kCaptureRequest, 20);
  put(DiagnosticKind::kCapture, "unknown", "{", 10);
  const auto idsOf = [&](std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), {"captures", "--json"});
    EXPECT_EQ(run(arguments), kDone) << err.str();
    std::string ids;
    for (const char* id : {"\"known\"", "\"unknown\""}) {
      if (out.str().find(id) != std::string::npos) ids += id;
    }
    return ids;
  };
  EXPECT_EQ(idsOf({}), "\"known\"\"unknown\"");
  EXPECT_EQ(idsOf({"-n", "1"}), "\"unknown\"");
  EXPECT_EQ(idsOf({"-n", "all"}), "\"known\"\"unknown\"");
  EXPECT_EQ(idsOf({"--since", "2026-11-20"}), "\"known\"");
  EXPECT_EQ(idsOf({"--since", "2026-11-21"}), "");
  EXPECT_EQ(idsOf({"list", "--until", "2026-11-21"}), "\"known\"");
  EXPECT_EQ(run({"captures", "--since", "then"}), kWrongUsage);
}

TEST_F(DiagnosticsCommandTest, ListsItemsOfItsKindOldestFirst) {
  put(DiagnosticKind::kCapture, "new", kCaptureRequest);
  put(DiagnosticKind::kCapture, "old", "{", 100);
  put(DiagnosticKind::kWhirlcap, "other", "{}");
  EXPECT_EQ(run({"captures"}), kDone);
  EXPECT_THAT(out.str(),
              ContainsRegex("id +when +what +process +bytes +problems *\n"
                            "old +\\(request.json cannot be read\\) +12288 +0 *\n"
                            "new +2026-11-20 10:18:00Z +alarms / Error / IssueDetector +alarmd +12288 +1"));
  EXPECT_THAT(out.str(), Not(HasSubstr("other")));
  const std::string table = out.str();
  EXPECT_EQ(run({"captures", "list"}), kDone);
  EXPECT_EQ(out.str(), table);
}

TEST_F(DiagnosticsCommandTest, ListsForPrograms) {
  put(DiagnosticKind::kCapture, "one", kCaptureRequest);
  const std::string line =
      R"({"id":"one","when":"2026-11-20T10:18:00Z","what":"alarms / Error / IssueDetector","process":"alarmd",)"
      R"("bytes":12288,"problems":1})"
      "\n";
  EXPECT_EQ(run({"captures", "--json"}), kDone);
  EXPECT_EQ(out.str(), line);
  EXPECT_EQ(run({"captures", "list", "--json"}), kDone);
  EXPECT_EQ(out.str(), line);
}

TEST_F(DiagnosticsCommandTest, ShowsTheLatestCapture) {
  put(DiagnosticKind::kCapture, "one", "{}", 100);
  put(DiagnosticKind::kCapture, "two", kCaptureRequest);
  EXPECT_EQ(run({"captures", "show", "--latest"}), kDone);
  EXPECT_EQ(out.str(),
            "capture two\n"
            "  what      alarms / Error / IssueDetector\n"
            "  when      2026-11-20 10:18:00Z\n"
            "  why       AudioAnalytics\n"
            "  process   alarmd\n"
            "  duration  60.0 s\n"
            "  payload   {\"key\":[1,null]}\n"
            "  folder    " +
                items.pathOf(DiagnosticKind::kCapture, "two") +
                "\n"
                "\n"
                "file          bytes\n"
                "load.txt      4\n"
                "request.json  " +
                std::to_string(std::string(kCaptureRequest).size()) +
                "\n"
                "\n"
                "missing or incomplete:\n"
                "  pipewire.json: pw-dump: ended with status 1\n");
}

TEST_F(DiagnosticsCommandTest, ShowsADraftAndAStallTrace) {
  put(DiagnosticKind::kIssueDraft, "one",
      R"({"title": "Invalid x/y", "component": {"name": "Ringwork", "version": "All", "identifier": 5},)"
      R"("processName": "ringworkd", "displayReason": "an error occurred"})");
  EXPECT_EQ(run({"drafts", "show", "one"}), kDone);
  EXPECT_THAT(out.str(),
              AllOf(HasSubstr("draft one\n"), HasSubstr("  what      Invalid x/y\n"),
                    HasSubstr("  why       an error occurred\n"), HasSubstr("  process   ringworkd\n"),
                    HasSubstr("  component Ringwork, version All\n")));
  put(DiagnosticKind::kWhirlcap, "two",
      R"({"requester": "com.orvane.tonewerk", "reason": "AudioOverloads", "description": "com.example.player"})");
  EXPECT_EQ(run({"whirlcaps", "show", "two"}), kDone);
  EXPECT_THAT(out.str(), AllOf(HasSubstr("  what      AudioOverloads\n"),
                               HasSubstr("  why       requested by com.orvane.tonewerk\n"),
                               HasSubstr("  process   com.example.player\n")));
}

TEST_F(DiagnosticsCommandTest, ShowsForProgramsWithTheWholeRequest) {
  put(DiagnosticKind::kWhirlcap, "one",
      "{\n  \"reason\": \"AudioOverloads\",\n  \"payload\": {\"bad\": null}\n}\n");
  EXPECT_EQ(run({"whirlcaps", "show", "one", "--json"}), kDone);
  EXPECT_EQ(out.str(), R"({"id":"one","folder":")" + items.pathOf(DiagnosticKind::kWhirlcap, "one") +
                           R"(","files":[{"name":"load.txt","bytes":4},{"name":"request.json","bytes":61}],)"
                           R"("request":{"reason":"AudioOverloads","payload":{"bad":null}}})"
                           "\n");
}

TEST_F(DiagnosticsCommandTest, ShowsWhatIsThereWhenTheRequestIsDamaged) {
  put(DiagnosticKind::kCapture, "one", "{");
  EXPECT_EQ(run({"captures", "show", "one"}), kDone);
  EXPECT_THAT(out.str(), AllOf(HasSubstr("request.json cannot be read\n"), HasSubstr("load.txt      4\n")));
  EXPECT_EQ(run({"captures", "show", "one", "--json"}), kDone);
  EXPECT_THAT(out.str(), HasSubstr(R"("request":null})"));
}

TEST_F(DiagnosticsCommandTest, SaysWhenThereIsNone) {
  EXPECT_EQ(run({"captures", "show", "--latest"}), kRefused);
  EXPECT_EQ(err.str(), "twctl: there is no capture\n");
  EXPECT_EQ(run({"drafts", "show", "x"}), kRefused);
  EXPECT_EQ(err.str(), "twctl: there is no draft \"x\"\n");
  EXPECT_EQ(run({"whirlcaps", "delete", "x"}), kRefused);
  EXPECT_EQ(err.str(), "twctl: there is no whirlcap \"x\"\n");
  EXPECT_EQ(run({"whirlcaps", "delete", "--all"}), kDone);
}

TEST_F(DiagnosticsCommandTest, DeletesThoseNamedOrAll) {
  for (const char* name : {"one", "two", "three"}) put(DiagnosticKind::kIssueDraft, name, "{}");
  put(DiagnosticKind::kCapture, "other", "{}");
  EXPECT_EQ(run({"drafts", "delete", "one", "nowhere", "two"}), kRefused);
  EXPECT_EQ(items.listAll().size(), 2u);
  EXPECT_TRUE(items.contains(DiagnosticKind::kIssueDraft, "three"));
  EXPECT_EQ(run({"drafts", "delete", "--all"}), kDone);
  EXPECT_THAT(items.list(DiagnosticKind::kIssueDraft), IsEmpty());
  EXPECT_TRUE(items.contains(DiagnosticKind::kCapture, "other"));
}

TEST_F(DiagnosticsCommandTest, NoNameLeavesTheDirectory) {
  put(DiagnosticKind::kCapture, "one", kCaptureRequest);
  std::filesystem::create_directories(directory.path("secret"));
  std::ofstream(directory.path("secret/request.json")) << kCaptureRequest;
  std::filesystem::create_directory_symlink(directory.path("secret"), directory.path("state/captures/link"));
  for (const std::string& name :
       {std::string("../../secret"), std::string(".."), std::string("."), std::string("link"),
        std::string("one/../one"), directory.path("secret"), std::string("")}) {
    EXPECT_EQ(run({"captures", "show", name}), kRefused) << name;
    EXPECT_THAT(out.str(), IsEmpty()) << name;
    EXPECT_EQ(run({"captures", "delete", name}), kRefused) << name;
  }
  EXPECT_TRUE(std::filesystem::exists(directory.path("secret/request.json")));
  EXPECT_TRUE(items.contains(DiagnosticKind::kCapture, "one"));
}

TEST_F(DiagnosticsCommandTest, RequiresAnIdentifier) {
  EXPECT_EQ(run({"captures", "show"}), kWrongUsage);
  EXPECT_EQ(run({"captures", "show", "one", "--latest"}), kWrongUsage);
  EXPECT_EQ(run({"captures", "show", "one", "two"}), kWrongUsage);
  EXPECT_EQ(run({"captures", "delete"}), kWrongUsage);
  EXPECT_EQ(run({"captures", "delete", "one", "--all"}), kWrongUsage);
  EXPECT_EQ(run({"captures", "rename"}), kWrongUsage);
}

TEST_F(DiagnosticsCommandTest, SaysWhatCannotBeRead) {
  std::filesystem::create_directories(directory.path("state"));
  std::ofstream(directory.path("state/captures")) << "not a directory";
  for (const auto& arguments : std::vector<std::vector<std::string>>{
           {"captures"}, {"captures", "show", "--latest"}, {"captures", "delete", "--all"}}) {
    EXPECT_EQ(run(arguments), kRefused);
    EXPECT_THAT(err.str(),
                HasSubstr("cannot read " + directory.path("state/captures/") + ": Not a directory"));
  }
}

TEST(DiagnosticSummaryTest, LetsNothingMoveTheCursor) {
  const auto summary = DiagnosticSummary::read(
      DiagnosticKind::kWhirlcap,
      "{\"description\": \"a\\u001b[2J\\u009bb\\nc\\u007f\", \"payload\": {\"\\u009b\": 1}}");
  ASSERT_TRUE(summary);
  EXPECT_EQ(summary->process, "a\\u001b[2J\\u009bb\\nc\\u007f");
  EXPECT_EQ(summary->payload, "{\"\\u009b\":1}");
}

TEST(DiagnosticSummaryTest, ReadsTheFieldsThatExist) {
  EXPECT_FALSE(DiagnosticSummary::read(DiagnosticKind::kCapture, "[]"));
  EXPECT_FALSE(DiagnosticSummary::read(DiagnosticKind::kCapture, ""));
  const auto summary = DiagnosticSummary::read(
      DiagnosticKind::kCapture, R"({"signature": 5, "duration": null, "problems": ["x"], "requestedAt": 7})");
  ASSERT_TRUE(summary);
  EXPECT_EQ(summary->what, "");
  EXPECT_EQ(summary->duration, "");
  EXPECT_EQ(summary->when, "7");
  EXPECT_THAT(summary->problems, IsEmpty());
}

}  // namespace
}  // namespace tonewerk

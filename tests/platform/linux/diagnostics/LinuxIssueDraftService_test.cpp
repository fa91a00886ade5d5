// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/LinuxIssueDraftService.h"

#include <future>
#include <gmock/gmock.h>
#include <memory>

#include "platform/Log.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/IssueDraftDocument.h"
#include "platform/linux/diagnostics/LinuxWhirlcapRequest.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using testing::AnyOf;
using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

TrackletDraft draft() {
  return {"Invalid coordinates",
          "Something went wrong.",
          {"Ringwork", "All", 4711},
          6,
          7,
          {"com.orvane.DiagnosticExtensions.audio"}};
}

class GraphCollector final : public DiagnosticCollector {
 public:
  std::string_view fileName() const override { return "pipewire.json"; }
  Result collect() override { return {"[]", ""}; }
};

// Tests both services with a real store.
class DiagnosticServicesTest : public testing::Test {
 protected:
  // The handler's argument; "-" if it was not called.
  std::optional<std::string> create(TrackletDraft tracklet, std::optional<std::string> process) {
    auto promise = std::make_shared<std::promise<std::optional<std::string>>>();
    auto answer = promise->get_future();
    drafts.createDraft(std::move(tracklet), std::move(process), "an error occurred",
                       [promise](const std::optional<std::string>& error) { promise->set_value(error); });
    return answer.wait_for(30s) == std::future_status::ready ? answer.get() : "-";
  }

  std::string read(DiagnosticKind kind, const std::string& file) {
    const auto entries = items.list(kind);
    if (entries.size() != 1) return "there are " + std::to_string(entries.size()) + " items";
    return items.readFile(kind, entries.front().name, file).value_or("no " + file);
  }

  TemporaryDirectory directory;
  DiagnosticsDirectory items{directory.path()};
  MemoryLog lines;
  LogCategory log{lines, "com.orvane.tonewerk", "twrs"};
  ManualClock clock;
  MemoryPreferenceStore preferences;
  NlohmannJsonService json;
  ThreadQueueFactory queues;
  DiagnosticsStore store{
      directory.path(), {std::make_shared<GraphCollector>()}, json, preferences, clock, log, {}};
  LinuxIssueDraftService drafts{store, queues};
  LinuxWhirlcapRequest whirlcaps{store, log};
};

TEST_F(DiagnosticServicesTest, LeavesADraftForProgramsAndForPeople) {
  EXPECT_EQ(create(draft(), "ringworkd"), std::nullopt);
  std::string problem;
  const std::optional<Value> request = json.parse(read(DiagnosticKind::kIssueDraft, "request.json"), problem);
  ASSERT_TRUE(request && request->asMap()) << problem;
  ValueMap map = *request->asMap();
  EXPECT_EQ(map.text(),
            R"({"title":"Invalid coordinates","problemDescription":"Something went wrong.",)"
            R"("component":{"name":"Ringwork","version":"All","identifier":4711},"reproducibility":6,)"
            R"("classification":7,"diagnosticExtensionIDs":["com.orvane.DiagnosticExtensions.audio"],)"
            R"("processName":"ringworkd","displayReason":"an error occurred",)"
            R"("requestedAt":"2025-11-20T10:18:00Z","collected":["pipewire.json"]})");
  EXPECT_EQ(read(DiagnosticKind::kIssueDraft, "draft.md"),
            "# Invalid coordinates\n"
            "\n"
            "Something went wrong.\n"
            "\n"
            "- **Component:** Ringwork, version All (4711)\n"
            "- **What happened:** an error occurred\n"
            "- **When:** 2025-11-20T10:18:00Z\n"
            "- **Process:** ringworkd\n"
            "- **Reproducibility:** 6\n"
            "- **Classification:** 7\n"
            "- **Diagnostic extensions:** com.orvane.DiagnosticExtensions.audio\n"
            "\n"
            "## Attached\n"
            "\n"
            "- `pipewire.json` (2 bytes)\n");
}

TEST_F(DiagnosticServicesTest, LeavesOutAProcessThatIsNotKnown) {
  EXPECT_EQ(create(draft(), std::nullopt), std::nullopt);
  EXPECT_THAT(read(DiagnosticKind::kIssueDraft, "request.json"), Not(HasSubstr("processName")));
  EXPECT_THAT(read(DiagnosticKind::kIssueDraft, "draft.md"), HasSubstr("- **Process:** not known\n"));
}

TEST_F(DiagnosticServicesTest, ShowsNamesAsTheyAre) {
  const IssueDraftDocument document{draft(), "# a*b\n<x>_[`", "why"};
  const std::string text = document.text(Date{0}, {{}, {{"pipewire.json", "no <graph>"}}});
  EXPECT_THAT(text, HasSubstr("- **Process:** \\# a\\*b \\<x\\>\\_\\[\\`\n"));
  EXPECT_THAT(text, HasSubstr("- `pipewire.json` is missing or incomplete: no \\<graph\\>\n"));
  EXPECT_THAT(document.text(Date{0}, {}), HasSubstr("## Attached\n\nNothing.\n"));
}

TEST_F(DiagnosticServicesTest, SaysWhyADraftCouldNotBeWritten) {
  preferences.configure(DiagnosticsStore::kPreferenceDomain, "max_megabytes", 1);
  TrackletDraft large = draft();
  large.problemDescription.assign(std::size_t{2} << 20, 'x');
  EXPECT_EQ(create(large, "ringworkd"), "File too large");
}

TEST_F(DiagnosticServicesTest, AnswersADraftThatTheStoreRefuses) {
  store.finish(0ms);
  EXPECT_EQ(create(draft(), "ringworkd"), "Operation canceled");
  EXPECT_THAT(items.listAll(), IsEmpty());
}

TEST_F(DiagnosticServicesTest, LeavesAStallTrace) {
  whirlcaps.request("com.orvane.tonewerk", "AudioOverloads", "com.example.player", {{"io_cycle", 7}},
                    {true, true});
  store.finish(30s);
  EXPECT_THAT(read(DiagnosticKind::kWhirlcap, "request.json"),
              HasSubstr("\"requester\": \"com.orvane.tonewerk\""));
  std::string problem;
  const std::optional<Value> request = json.parse(read(DiagnosticKind::kWhirlcap, "request.json"), problem);
  ASSERT_TRUE(request && request->asMap()) << problem;
  EXPECT_EQ(
      request->asMap()->text(),
      R"({"requester":"com.orvane.tonewerk","reason":"AudioOverloads","description":"com.example.player",)"
      R"("payload":{"io_cycle":7},"flags":[true,true],"requestedAt":"2025-11-20T10:18:00Z",)"
      R"("collected":["pipewire.json"]})");
  EXPECT_EQ(read(DiagnosticKind::kWhirlcap, "pipewire.json"), "[]");
}

TEST_F(DiagnosticServicesTest, SaysWhichStallTraceWasNotTaken) {
  store.finish(0ms);
  whirlcaps.request("com.orvane.tonewerk", "AudioOverloads", "", {}, {true, true});
  EXPECT_THAT(lines.textsAt(LogLevel::kError),
              ElementsAre("stall trace not collected. requester=com.orvane.tonewerk reason=AudioOverloads: "
                          "Operation canceled"));
}

TEST_F(DiagnosticServicesTest, TooManyStallTracesAreLimitedAndLoggedOnce) {
  preferences.configure(DiagnosticsStore::kPreferenceDomain, "max_items", 5);
  for (int count = 0; count < 2000; ++count) whirlcaps.request("r", "s", "", {}, {true, true});
  store.finish(30s);
  EXPECT_LE(items.listAll().size(), 5u);
  // The store logs the beginning and the end, but not each request.
  const std::vector<std::string> errors = lines.textsAt(LogLevel::kError);
  EXPECT_THAT(errors, Contains("too many diagnostics at once; requests are refused"));
  EXPECT_THAT(errors, Each(AnyOf("too many diagnostics at once; requests are refused",
                                 StartsWith("diagnostics are taken again; refused meanwhile: "))));
}

}  // namespace
}  // namespace tonewerk

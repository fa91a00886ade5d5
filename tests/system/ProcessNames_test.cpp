// SPDX-License-Identifier: Apache-2.0
//
// Tests the name of a client's process in all places that show it.
#include <filesystem>
#include <nlohmann/json.hpp>
#include <string>
#include <sys/prctl.h>
#include <vector>

#include "support/OtlpReceiver.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::Contains;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr const char* kSummary = "com.orvane.unknown.Session_Generic.Summary";
constexpr const char* kUptime = "com.orvane.tonewerk.twreportingclientuptime";

// The kernel keeps fifteen bytes: all but the second half of the last character.
constexpr const char* kName = "lecteur-musiqu\u00E9";
constexpr const char* kNameAsText = "lecteur-musiqu\uFFFD";

// Changes the name of this process while the object exists. Runs on the first thread of the process.
class ProcessName {
 public:
  explicit ProcessName(const char* name) {
    ::prctl(PR_GET_NAME, before_);
    ::prctl(PR_SET_NAME, name);
  }
  ProcessName(const ProcessName&) = delete;
  ProcessName& operator=(const ProcessName&) = delete;
  ~ProcessName() { ::prctl(PR_SET_NAME, before_); }

 private:
  char before_[16] = {};
};

// Runs an internal build, where every session has its summary file, with an endpoint in the network.
class ProcessNamesTest : public DaemonTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
    ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.linkreport.toml",
                                          "backends = ['" + receiver.address() + "']\n"));
    ASSERT_TRUE(daemon.start());
  }

  std::vector<json> waitForEvent(const std::string& name) const {
    std::vector<json> events;
    waitUntil([&] { return !(events = RecordedEvents(daemon.storePath()).named(name)).empty(); });
    return events;
  }

  // The only summary file, once it is complete.
  json summaryFile() const {
    json file;
    EXPECT_TRUE(waitUntil([&] {
      std::error_code error;
      const std::filesystem::directory_iterator entry(daemon.path(DaemonProcess::kLogs, "Audio/Reporting"),
                                                      error);
      if (error || entry == std::filesystem::directory_iterator()) return false;
      file = json::parse(textOfFile(entry->path()), nullptr, false);
      return !file.is_discarded();
    }));
    return file;
  }

  OtlpReceiver receiver;
};

TEST_F(ProcessNamesTest, ANameThatIsCutInACharacterIsTextInEverythingThatComesOfTheSession) {
  const ProcessName name(kName);
  {
    DaemonClient client = connect();
    client.create(kSession);
    client.start(kSession);
    client.send({{"a", 1}}, 4, kTypeStart, {kSession});

    const auto line =
        outputOf({TONEWERK_TWCTL_PATH, {"top", "--json", "--interval", "0.1"}, daemon.clientEnvironment()});
    ASSERT_TRUE(line);
    const json shown = json::parse(*line, nullptr, false);
    ASSERT_TRUE(shown.is_object()) << *line;
    EXPECT_EQ(shown.at("processName"), kNameAsText);
    client.stop(kSession);
  }
  const std::vector<json> summaries = waitForEvent(kSummary);
  ASSERT_THAT(summaries, SizeIs(1));
  ASSERT_TRUE(summaries[0].is_object());
  EXPECT_EQ(summaries[0].at("clientProcessName"), kNameAsText);
  // One of several events, because twctl is a client too.
  EXPECT_TRUE(waitUntil([&] {
    for (const json& event : waitForEvent(kUptime)) {
      if (event.is_object() && event.at("processName") == kNameAsText) return true;
    }
    return false;
  }));
  EXPECT_EQ(summaryFile().back().at("Session_Generic_Summary_1").at("clientProcessName"), kNameAsText);
}

// Endpoints accept only UTF-8, and would refuse a whole batch because of one name.
TEST_F(ProcessNamesTest, ANameThatIsCutInACharacterIsTextInWhatAnEndpointGets) {
  const ProcessName name(kName);
  {
    DaemonClient client = connect();
    client.create(kSession);
    client.start(kSession);
    client.send({{"a", 1}}, 4, kTypeStart, {kSession});
    client.stop(kSession);
  }
  EXPECT_EQ(daemon.stop(), 0);  // after everything was sent
  ASSERT_THAT(receiver.requests(), Not(IsEmpty()));
  ASSERT_THAT(receiver.problems(), IsEmpty());
  std::vector<json> attributes;
  for (const json& record : receiver.records()) {
    const json& some = record.at("attributes");
    attributes.insert(attributes.end(), some.begin(), some.end());
  }
  const json expected{{"key", "clientProcessName"}, {"value", {{"stringValue", kNameAsText}}}};
  EXPECT_THAT(attributes, Contains(expected));
}

}  // namespace
}  // namespace tonewerk

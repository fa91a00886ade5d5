// SPDX-License-Identifier: Apache-2.0
//
// Tests a test session's trace, from a program's signposts to the benchmark data file, with the real tracer.
#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "support/TracingLock.h"
#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kTest = 11;
constexpr double kNanosecondsPerMillisecond = 1e6;
// The trace's nanoseconds are converted to seconds and to milliseconds before they reach the file.
constexpr double kRounding = 1.0;
constexpr double kClockError = 0.1;  // seconds

double secondsNow() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// A program's measurements of the intervals of one name; each list is in ascending order.
struct Measured {
  std::vector<double> least;
  std::vector<double> most;
};

class PerformanceTraceTest : public DaemonTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
    daemon.setEnvironment("TONEWERK_SIGNPOSTS", TONEWERK_SIGNPOST_LIBRARY);
  }

  // Starts a test session with this probe list.
  DaemonClient startTracing(const std::string& probes) {
    EXPECT_TRUE(daemon.writeConfiguration("probes.json", probes));
    EXPECT_TRUE(daemon.start());
    DaemonClient client = connect();
    client.create(kSession, kTest);
    client.setConfiguration(kSession, {{"TWReportingKolviPlistFilePath",
                                        daemon.path(DaemonProcess::kConfiguration, "probes.json")}});
    client.start(kSession);
    return client;
  }

  static Measured measuredOf(const std::string& output, const std::string& wanted) {
    Measured measured;
    std::istringstream lines(output);
    std::string name;
    double least = 0.0;
    double most = 0.0;
    while (lines >> name >> least >> most) {
      if (name != wanted) continue;
      measured.least.push_back(least);
      measured.most.push_back(most);
    }
    std::sort(measured.least.begin(), measured.least.end());
    std::sort(measured.most.begin(), measured.most.end());
    return measured;
  }

  std::vector<std::filesystem::path> files() const {
    std::vector<std::filesystem::path> found;
    std::error_code error;
    const std::filesystem::directory_iterator all(daemon.path(DaemonProcess::kLogs, "Audio/Traces"), error);
    if (!error) {
      for (const auto& entry : all) found.push_back(entry.path());
    }
    return found;
  }

  // The contents of the only file.
  json file() const {
    const auto paths = files();
    EXPECT_THAT(paths, SizeIs(1)) << daemon.log();
    if (paths.size() != 1) return {{"context", {}}, {"benchmarks", json::array()}};
    std::ifstream stream(paths.front());
    return json::parse(stream);
  }

  // Durations of the intervals of one name, in nanoseconds, in ascending order.
  static std::vector<double> durations(const json& file, const std::string& name) {
    std::vector<double> found;
    for (const json& entry : file.at("benchmarks")) {
      if (entry.at("name") != name) continue;
      EXPECT_EQ(entry.at("time_unit"), "ms");
      found.push_back(entry.at("real_time").get<double>() * kNanosecondsPerMillisecond);
    }
    std::sort(found.begin(), found.end());
    return found;
  }

  const TracingLock turn;
};

TEST_F(PerformanceTraceTest, ATestSessionLeavesHowLongItsIntervalsTook) {
  DaemonClient client = startTracing(
      R"([{"name": "decode", "type": "interval", "children": [{"name": "mix", "type": "interval"}]}])");
  const double before = secondsNow();
  const auto output = outputOf(
      {TONEWERK_SIGNPOST_PROGRAM, {"2", "250"}, {{"TONEWERK_SIGNPOSTS", TONEWERK_SIGNPOST_LIBRARY}}});
  ASSERT_TRUE(output.has_value());
  const double after = secondsNow();
  client.stop(kSession);

  const json found = file();
  EXPECT_EQ(found.at("context").at("data_name"), "TWReporting");
  EXPECT_EQ(found.at("context").at("results_version"), 4);
  EXPECT_EQ(found.at("context").at("reporter_id"), kSession);
  EXPECT_THAT(found.at("benchmarks"), SizeIs(1000));
  for (const json& entry : found.at("benchmarks")) {
    // The tracer reads the difference of its clock to the time of day only once, and not at the same instant.
    EXPECT_GT(entry.at("begin").get<double>(), before - kClockError);
    EXPECT_LT(entry.at("begin").get<double>(), after + kClockError);
  }
  for (const char* name : {"decode", "mix"}) {
    const Measured measured = measuredOf(*output, name);
    const std::vector<double> traced = durations(found, name);
    ASSERT_THAT(measured.least, SizeIs(500));
    ASSERT_THAT(traced, SizeIs(500)) << name;
    // Each duration lies within its own bounds, so the sorted durations also lie within the sorted bounds.
    for (std::size_t i = 0; i < traced.size(); ++i) {
      EXPECT_GE(traced[i] + kRounding, measured.least[i]) << name;
      EXPECT_LE(traced[i] - kRounding, measured.most[i]) << name;
    }
  }
}

TEST_F(PerformanceTraceTest, TheDaemonsOwnRequestsCarrySignposts) {
  DaemonClient client = startTracing(R"({"name": "Sending", "type": "interval", "signpost": "sendMessage"})");
  for (int i = 0; i < 5; ++i) client.send({{"a", i}}, 4, 1, {kSession});
  client.stop(kSession);
  EXPECT_THAT(durations(file(), "Sending"), SizeIs(5));
}

TEST_F(PerformanceTraceTest, ASessionStartedAgainLeavesASecondFile) {
  DaemonClient client = startTracing(R"({"name": "sendMessage", "type": "interval"})");
  client.send({{"a", 1}}, 4, 1, {kSession});
  client.stop(kSession);
  client.setConfiguration(kSession, {{"TWReportingKolviOutputFileName", "second.bdj"}});
  client.start(kSession);
  client.send({{"a", 2}}, 4, 1, {kSession});
  client.send({{"a", 3}}, 4, 1, {kSession});
  client.stop(kSession);
  std::ifstream stream(daemon.path(DaemonProcess::kLogs, "Audio/Traces/second.bdj"));
  ASSERT_TRUE(stream.good()) << daemon.log();
  EXPECT_THAT(durations(json::parse(stream), "sendMessage"), SizeIs(2));
  EXPECT_THAT(files(), SizeIs(2));
}

TEST_F(PerformanceTraceTest, NothingOfATraceStaysBehind) {
  DaemonClient client = startTracing(R"({"name": "sendMessage", "type": "interval"})");
  client.send({{"a", 1}}, 4, 1, {kSession});
  client.stop(kSession);
  client.destroy(kSession);
  EXPECT_EQ(daemon.stop(), 0);
  std::vector<std::string> left;
  for (const auto& entry :
       std::filesystem::directory_iterator(daemon.path(DaemonProcess::kState, "traces"))) {
    if (entry.is_directory()) left.push_back(entry.path());
  }
  EXPECT_THAT(left, IsEmpty());
}

TEST_F(PerformanceTraceTest, TellsProgramsThatSignpostsCanBeTraced) {
  const auto isMarked = [this] {
    return std::filesystem::exists(daemon.path(DaemonProcess::kRuntime, "signposts"));
  };
  ASSERT_TRUE(daemon.start());
  EXPECT_TRUE(waitUntil(isMarked));
  EXPECT_EQ(daemon.stop(), 0);
  ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = false\n"));
  ASSERT_TRUE(daemon.start());
  EXPECT_TRUE(waitUntil([&] { return !isMarked(); }));
}

TEST_F(PerformanceTraceTest, WithoutASessionDaemonTheSessionRunsUntraced) {
  daemon.setEnvironment("PATH", "/nowhere");
  DaemonClient client = startTracing(R"({"name": "sendMessage", "type": "interval"})");
  if (logLinesWith("Performance Trace Started") > 0) GTEST_SKIP() << "a session daemon runs already";
  EXPECT_EQ(logLinesWith("runtraceDidStart lttng-sessiond cannot be started: "), 1U) << daemon.log();
  client.send({{"a", 1}}, 4, 1, {kSession});
  client.stop(kSession);
  EXPECT_THAT(files(), IsEmpty());
}

TEST_F(PerformanceTraceTest, AClientThatGoesAwayLeavesItsFile) {
  {
    DaemonClient client = startTracing(R"({"name": "sendMessage", "type": "interval"})");
    client.send({{"a", 1}}, 4, 1, {kSession});
    client.disconnect();
  }
  EXPECT_TRUE(waitUntil([this] { return files().size() == 1; })) << daemon.log();
}

}  // namespace
}  // namespace tonewerk

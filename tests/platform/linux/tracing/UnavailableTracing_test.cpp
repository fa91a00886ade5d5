// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/UnavailableTracing.h"

#include <gmock/gmock.h>
#include <vector>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

struct Listener final : RuntraceSessionDelegate {
  std::vector<std::string> heard;
  void runtraceDidStart(const RuntraceError& error) override {
    heard.push_back("start " + error.value_or(""));
  }
  void runtraceDidStop(const RuntraceError&) override { heard.emplace_back("stop"); }
  void runtraceDidComplete(const std::string&, const RuntraceToken&, const RuntraceError&) override {
    heard.emplace_back("complete");
  }
};

TEST(UnavailableTracingTest, AStartSaysWhyThereIsNoTrace) {
  UnavailableRuntrace runtrace("not built in");
  const auto listener = std::make_shared<Listener>();
  const auto session = runtrace.makeSession({.probeListPath = "/probes.json"});
  session->setDelegate(listener);
  EXPECT_FALSE(session->isValid());
  session->startRuntrace();
  session->stopRuntrace();
  EXPECT_THAT(listener->heard, ElementsAre("start not built in"));
}

TEST(UnavailableTracingTest, WorksWithoutADelegate) {
  UnavailableRuntrace runtrace("not built in");
  const auto session = runtrace.makeSession({});
  session->startRuntrace();
  auto listener = std::make_shared<Listener>();
  session->setDelegate(listener);
  session->setDelegate({});
  session->startRuntrace();
  EXPECT_THAT(listener->heard, IsEmpty());
}

TEST(UnavailableTracingTest, NoTraceOpens) {
  std::string problem;
  EXPECT_EQ(UnavailableKolvi("not built in").openModel("/trace", problem), nullptr);
  EXPECT_EQ(problem, "not built in");
}

}  // namespace
}  // namespace tonewerk

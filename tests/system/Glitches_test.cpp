// SPDX-License-Identifier: Apache-2.0
//
// Tests whom a verdict on an overload names, in a real graph with programs that miss their time in known
// ways.
//
// While the machine is busy, any program can be late at any time, and its verdict is right. So the tests ask
// only whether there is a verdict that names the known culprit of a deed that is far longer than anything the
// machine does of itself.
#include <chrono>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <map>
#include <nlohmann/json.hpp>
#include <signal.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "support/TemporaryDirectory.h"
#include "system/support/DaemonProcess.h"
#include "system/support/PrivatePipeWire.h"
#include "system/support/RecordedEvents.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

// A program of the graph that does what it is told.
class Culprit {
 public:
  Culprit(const PrivatePipeWire& graph, const TemporaryDirectory& directory, std::string name)
      : graph_(graph),
        pipe_(directory.path(name + ".commands")),
        log_(directory.path(name + ".log")),
        name_(std::move(name)) {}

  bool start(bool isFilter) {
    if (::mkfifo(pipe_.c_str(), 0600) != 0) return false;
    // Open for both, so that neither side waits for the other.
    commands_.reset(::open(pipe_.c_str(), O_RDWR | O_CLOEXEC));
    std::vector<std::string> arguments = {"--name", name_};
    if (isFilter) arguments.emplace_back("--filter");
    return commands_ &&
           process_.start({TONEWERK_CULPRIT_PATH, arguments, graph_.environment(), pipe_}, log_, log_);
  }
  // In the next cycle.
  void tell(const std::string& command) const {
    const std::string line = command + "\n";
    EXPECT_EQ(::write(commands_.get(), line.data(), line.size()), static_cast<ssize_t>(line.size()));
  }
  // Whether its audio thread has had a cycle since it was told to do this.
  bool hasDone(const std::string& what) const { return textOfFile(log_).find(what) != std::string::npos; }
  void signal(int number) const { process_.signal(number); }
  std::string log() const { return textOfFile(log_); }

 private:
  const PrivatePipeWire& graph_;
  const std::string pipe_;
  const std::string log_;
  const std::string name_;
  FileDescriptor commands_;
  ChildProcess process_;
};

class GlitchesTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon.start());
    ASSERT_TRUE(graph.start());
    ASSERT_TRUE(graph.addSink("speaker", "Test Speaker"));
    std::map<std::string, std::string> environment = graph.environment();
    environment.merge(daemon.clientEnvironment());
    ASSERT_TRUE(bridge.start({TONEWERK_BRIDGE_PATH, {}, environment}, directory.path("bridge"),
                             directory.path("bridge")));
    ASSERT_TRUE(waitUntil([&] {
      const std::string said = textOfFile(directory.path("bridge"));
      return said.find("connected to PipeWire") != std::string::npos &&
             said.find("connected to the reporting daemon") != std::string::npos;
    }));
  }
  void TearDown() override {
    if (!HasFailure()) return;
    std::fprintf(stderr, "--- bridge:\n%s--- graph:\n%s--- verdicts:\n",
                 textOfFile(directory.path("bridge")).c_str(), graph.log().c_str());
    for (const nlohmann::json& verdict : verdicts()) std::fprintf(stderr, "%s\n", verdict.dump().c_str());
  }

  bool link(const std::string& output, const std::string& input, const std::string& inputPort) const {
    for (const std::string channel : {"FL", "FR"}) {
      const std::vector<std::string> ports = {output + ":output_" + channel,
                                              input + ":" + inputPort + "_" + channel};
      if (!waitUntil([&] { return graph.outputOf("pw-link", ports).has_value(); })) return false;
    }
    return true;
  }
  // Waits until its audio runs.
  static bool isPlaying(const Culprit& culprit) {
    culprit.tell("compute 0");
    return waitUntil([&] { return culprit.hasDone("compute"); });
  }

  std::vector<nlohmann::json> verdicts() const {
    std::vector<nlohmann::json> found;
    for (const nlohmann::json& message :
         RecordedEvents(daemon.storePath()).named("com.orvane.longformaudio.IO.Error")) {
      if (message.contains("glitch_id")) found.push_back(message);
    }
    return found;
  }
  // Whether a verdict names this node and this cause first in the chain.
  bool isNamed(const std::string& node, const std::string& cause) const {
    for (const nlohmann::json& verdict : verdicts()) {
      if (verdict.value("glitch_culprit_node", "") == node &&
          verdict.value("glitch_first_cause", "") == cause) {
        return true;
      }
    }
    return false;
  }
  // On a busy machine a program may compute for long because it does not get a processor, and the verdict
  // then says so. The next time it may get one.
  bool isNamedAfter(const Culprit& culprit, const std::string& command, const std::string& node,
                    const std::string& cause) const {
    for (int attempt = 0; attempt < 6; ++attempt) {
      culprit.tell(command);
      if (waitUntil([&] { return isNamed(node, cause); }, seconds(10))) return true;
    }
    return false;
  }

  const TemporaryDirectory directory;
  DaemonProcess daemon;
  PrivatePipeWire graph;
  ChildProcess bridge;
  Culprit player{graph, directory, "player"};
  Culprit first{graph, directory, "first"};
  Culprit second{graph, directory, "second"};
};

TEST_F(GlitchesTest, NamesAProgramThatComputesTooLong) {
  ASSERT_TRUE(player.start(false));
  ASSERT_TRUE(link("player", "speaker", "playback"));
  ASSERT_TRUE(isPlaying(player));
  EXPECT_TRUE(isNamedAfter(player, "compute 300", "player", "late"));
}

TEST_F(GlitchesTest, NamesAProgramThatIsStopped) {
  ASSERT_TRUE(player.start(false));
  ASSERT_TRUE(link("player", "speaker", "playback"));
  ASSERT_TRUE(isPlaying(player));
  player.signal(SIGSTOP);
  EXPECT_TRUE(waitUntil([&] { return isNamed("player", "stuck"); }));
  player.signal(SIGCONT);
}

TEST_F(GlitchesTest, NamesTheFirstLateFilterOfAChainToThePlayersSession) {
  ASSERT_TRUE(player.start(false) && first.start(true) && second.start(true));
  ASSERT_TRUE(link("player", "first", "input") && link("first", "second", "input") &&
              link("second", "speaker", "playback"));
  ASSERT_TRUE(isPlaying(player) && isPlaying(first) && isPlaying(second));
  EXPECT_TRUE(isNamedAfter(first, "compute 300", "first", "late"));
}

}  // namespace
}  // namespace tonewerk

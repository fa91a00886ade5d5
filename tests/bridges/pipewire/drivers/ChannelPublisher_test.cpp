// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/ChannelPublisher.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sstream>

#include "bridges/pipewire/drivers/PublishingSessionSink.h"
#include "bridges/pipewire/sessions/ConsoleOutput.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualEventLoop.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

class ChannelPublisherTest : public ::testing::Test {
 protected:
  static constexpr const char* kName = "bridge.json";

  std::string file(const std::string& runtime) const { return runtime + "/channels/" + kName; }
  std::string published() const { return textOf(file(directory.path())); }
  static std::string textOf(const std::string& path) {
    std::ifstream stream(path);
    std::ostringstream text;
    text << stream.rdbuf();
    return stream ? text.str() : "no file";
  }

  const TemporaryDirectory directory;
  ConsoleOutput output;
  Console console{false, output.file()};
  ManualClock clock;
  ManualEventLoop loop{clock};
  std::int64_t value = 1;
  ChannelPublisher publisher{loop, clock, console, kName, [this] { return ValueMap{{"value", value}}; }};
};

TEST_F(ChannelPublisherTest, WritesNothingBeforeItIsOpened) {
  publisher.changed();
  publisher.publish();
  clock.advance(5.0);
  EXPECT_TRUE(std::filesystem::is_empty(directory.path()));
}

TEST_F(ChannelPublisherTest, PublishesWhenItIsOpened) {
  publisher.open(directory.path());
  EXPECT_EQ(published(), "{\"value\":1}\n");
  EXPECT_EQ(output.text(), "");
}

TEST_F(ChannelPublisherTest, ReplacesTheFileOfADeadProcess) {
  std::filesystem::create_directory(directory.path("channels"));
  std::ofstream(file(directory.path())) << "{\"value\": 77, \"half";
  std::ofstream(file(directory.path()) + ".new") << "rest";
  publisher.open(directory.path());
  EXPECT_EQ(published(), "{\"value\":1}\n");
  EXPECT_FALSE(std::filesystem::exists(file(directory.path()) + ".new"));
}

TEST_F(ChannelPublisherTest, WritesChangesOnceInASecond) {
  publisher.open(directory.path());
  clock.advance(milliseconds(400));
  value = 2;
  publisher.changed();
  value = 3;
  publisher.changed();
  clock.advance(milliseconds(599));
  EXPECT_EQ(published(), "{\"value\":1}\n");
  clock.advance(milliseconds(1));
  EXPECT_EQ(published(), "{\"value\":3}\n");

  clock.advance(milliseconds(1000));
  value = 4;
  publisher.changed();
  EXPECT_EQ(published(), "{\"value\":4}\n");
}

TEST_F(ChannelPublisherTest, LeavesTheFileAloneWhenNothingChanged) {
  publisher.open(directory.path());
  std::filesystem::remove(file(directory.path()));
  clock.advance(2.0);
  publisher.changed();
  EXPECT_EQ(published(), "no file");
  value = 2;
  publisher.changed();
  clock.advance(1.0);
  EXPECT_EQ(published(), "{\"value\":2}\n");
}

// The service manager removes the runtime directory when the service stops.
TEST_F(ChannelPublisherTest, WritesAgainForARestartedDaemonWithAnEmptyDirectory) {
  publisher.open(directory.path());
  std::filesystem::remove_all(directory.path("channels"));
  publisher.open(directory.path());
  EXPECT_EQ(published(), "{\"value\":1}\n");
}

TEST_F(ChannelPublisherTest, FollowsADaemonToAnotherDirectory) {
  const std::string other = directory.path("other");
  std::filesystem::create_directory(other);
  publisher.open(directory.path());
  publisher.open(other);
  EXPECT_EQ(published(), "no file");
  EXPECT_EQ(textOf(file(other)), "{\"value\":1}\n");
}

TEST_F(ChannelPublisherTest, RemovesTheFileAndWritesNoMoreAfterWithdraw) {
  publisher.open(directory.path());
  value = 2;
  publisher.changed();
  publisher.withdraw();
  EXPECT_EQ(published(), "no file");
  clock.advance(5.0);
  publisher.changed();
  publisher.publish();
  EXPECT_EQ(published(), "no file");
}

TEST_F(ChannelPublisherTest, ReportsAFailureOnceAndTriesAgain) {
  const std::string runtime = directory.path("later");
  publisher.open(runtime);
  value = 2;
  publisher.publish();
  EXPECT_EQ(countOf(output.text(), "cannot publish driver channels in " + runtime + "/channels"), 1);
  EXPECT_THAT(output.text(), HasSubstr("No such file or directory"));
  std::filesystem::create_directory(runtime);
  publisher.publish();
  EXPECT_EQ(textOf(file(runtime)), "{\"value\":2}\n");

  std::filesystem::remove_all(runtime);
  value = 3;
  publisher.publish();
  EXPECT_EQ(countOf(output.text(), "cannot publish"), 2);
}

// Records the content of the file at each call.
class ReadingSink final : public SessionSink {
 public:
  explicit ReadingSink(std::function<std::string()> read) : read_(std::move(read)) {}
  void create(std::int64_t) override { note("create"); }
  void configure(std::int64_t, std::uint16_t, const ValueMap&) override { note("configure"); }
  void start(std::int64_t) override { note("start"); }
  void message(std::int64_t, std::uint32_t, std::uint16_t, ValueMap) override { note("message"); }
  void stop(std::int64_t) override { note("stop"); }
  void destroy(std::int64_t) override { note("destroy"); }

  std::vector<std::string> notes;

 private:
  void note(const char* call) { notes.push_back(call + (" " + read_())); }
  std::function<std::string()> read_;
};

TEST_F(ChannelPublisherTest, IsUpToDateBeforeASessionBeginsAndBeforeItEnds) {
  ReadingSink reader([this] { return published(); });
  PublishingSessionSink sink(reader, publisher);
  publisher.open(directory.path());
  value = 2;
  sink.create(9);
  sink.configure(9, 7, {});
  sink.start(9);
  value = 3;
  sink.message(9, 5, 0, {});
  sink.stop(9);
  value = 4;
  sink.destroy(9);
  EXPECT_THAT(reader.notes,
              ElementsAre("create {\"value\":2}\n", "configure {\"value\":2}\n", "start {\"value\":2}\n",
                          "message {\"value\":2}\n", "stop {\"value\":3}\n", "destroy {\"value\":3}\n"));
}

}  // namespace
}  // namespace tonewerk

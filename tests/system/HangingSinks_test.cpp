// SPDX-License-Identifier: Apache-2.0
//
// Tests the daemon while a sink hangs: a disk, or the log.
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <gmock/gmock.h>
#include <string>
#include <sys/stat.h>
#include <sys/types.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "system/support/DaemonTest.h"
#include "system/support/StoppedThread.h"

namespace tonewerk {
namespace {

constexpr AudioServiceType kTest = 11;
constexpr std::size_t kMegabyte = std::size_t{1} << 20;
constexpr const char* kFilesThread = "reporting.files";

class HangingSinksTest : public DaemonTest {
 protected:
  // Stops a session of the service "test" after it got so many bytes. Its file is queued then.
  static void report(DaemonClient& client, ReporterID session, std::size_t megabytes) {
    client.create(session, kTest);
    client.start(session);
    for (std::size_t sent = 0; sent < megabytes; ++sent) {
      client.send({{"number", static_cast<std::int64_t>(sent)}, {"text", std::string(kMegabyte - 4096, 'x')}},
                  4, 1, {session});
    }
    client.stop(session);
  }

  // One of the daemon's sinks, as it stands.
  static ValueMap sinkOf(DaemonClient& client, const std::string& name) {
    const Answer answer = client.call("watch.accounts");
    if (!answer.result || answer.result->asMap() == nullptr) return {};
    const Value* const sinks = answer.result->asMap()->find("sinks");
    if (sinks == nullptr) return {};
    for (const Value& sink : *sinks->asArray()) {
      if (sink.asMap()->text("name") == name) return *sink.asMap();
    }
    return {};
  }

  // What `twctl status` prints, which is that something is wrong.
  std::string status() const {
    ChildProcess twctl;
    const TemporaryDirectory output;
    EXPECT_TRUE(twctl.start({TONEWERK_TWCTL_PATH, {"status"}, daemon.clientEnvironment()},
                            output.path("output"), output.path("errors")));
    EXPECT_EQ(twctl.wait(), 1);
    return textOfFile(output.path("output"));
  }

  std::size_t jsonFiles() const {
    std::size_t count = 0;
    std::error_code error;
    for (const auto& entry :
         std::filesystem::directory_iterator(daemon.path(DaemonProcess::kLogs, "Audio/Reporting"), error)) {
      if (entry.path().extension() == ".json") ++count;
    }
    return count;
  }
};

// Once, the work queue waited as long as the disk did, and so did all clients.
TEST_F(HangingSinksTest, ClientsAreServedWhileTheDiskOfTheJsonFilesHangs) {
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  {
    const StoppedThread files(daemon.process().identifier(), kFilesThread, StoppedThread::WaitsIn::kFutex);
    report(client, 1, 65);
    report(client, 2, 1);  // does not fit; waits only for the hold time
    EXPECT_EQ(logLinesWith("jsonFiles hangs; what does not fit is dropped"), 1U);
    const ValueMap sink = sinkOf(client, "jsonFiles");
    EXPECT_EQ(sink.integer("waiting"), 1);
    EXPECT_EQ(sink.integer("dropped"), 1);
    EXPECT_GT(sink.integer("hangs"), 0);
    EXPECT_EQ(jsonFiles(), 0U);
  }
  EXPECT_TRUE(waitForLogLine("jsonFiles makes progress again; dropped meanwhile: 1"));
  report(client, 3, 1);
  EXPECT_TRUE(waitUntil([&] { return jsonFiles() == 2; }));
  EXPECT_EQ(sinkOf(client, "jsonFiles").integer("hangs"), 0);
}

TEST_F(HangingSinksTest, TheDaemonEndsAlthoughTheDiskOfTheJsonFilesHangs) {
  ASSERT_TRUE(daemon.start());
  {
    DaemonClient client = connect();
    const StoppedThread files(daemon.process().identifier(), kFilesThread, StoppedThread::WaitsIn::kFutex);
    report(client, 1, 1);
    daemon.process().signal(SIGTERM);
    EXPECT_TRUE(waitForLogLine("jsonFiles hangs; what is not written is lost: 1"));
  }
  EXPECT_EQ(daemon.process().wait(), 1);
}

TEST_F(HangingSinksTest, ClientsAreServedWhileTheDiskOfTheStoreHangs) {
  constexpr AudioServiceType kLongFormAudio = 7;
  constexpr int kMessages = 9'000;  // more than the store's queue takes
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  client.create(1, kLongFormAudio);
  client.start(1);
  ASSERT_TRUE(waitUntil([&] { return sinkOf(client, "store").integer("waiting") == 0; }));
  std::int64_t dropped = 0;
  {
    const StoppedThread store(daemon.process().identifier(), "tw-store", StoppedThread::WaitsIn::kFutex);
    for (int sent = 0; sent < kMessages; ++sent) client.send({{"number", sent}}, 4, 1, {1});
    EXPECT_TRUE(waitForLogLine("hangs; what does not fit is dropped"));
    const ValueMap sink = sinkOf(client, "store");
    dropped = sink.integer("dropped");
    EXPECT_GT(dropped, 0);
    EXPECT_GT(sink.integer("waiting"), 0);
    EXPECT_GT(sink.integer("hangs"), 0);
    EXPECT_THAT(status(), testing::ContainsRegex("store +[0-9]+ +" + std::to_string(dropped) + " +[0-9]+ s"));
    EXPECT_EQ(client.serviceType(1), kLongFormAudio);
  }
  EXPECT_TRUE(waitUntil([&] { return sinkOf(client, "store").integer("waiting") == 0; }));
  EXPECT_EQ(sinkOf(client, "store").integer("hangs"), 0);
  EXPECT_EQ(sinkOf(client, "store").integer("dropped"), dropped);
  EXPECT_EQ(daemon.stop(), 0);
}

TEST_F(HangingSinksTest, TheDaemonEndsAlthoughTheDiskOfTheStoreHangsAndSaysWhatIsLost) {
  ASSERT_TRUE(daemon.start());
  {
    DaemonClient client = connect();
    client.create(1, kTest);
    client.start(1);
    ASSERT_TRUE(waitUntil([&] { return sinkOf(client, "store").integer("waiting") == 0; }));
    const StoppedThread store(daemon.process().identifier(), "tw-store", StoppedThread::WaitsIn::kFutex);
    client.send({{"number", 1}}, 4, 1, {1});
    daemon.process().signal(SIGTERM);
    EXPECT_TRUE(waitForLogLine("store hangs; what is not written is lost: "));
    EXPECT_EQ(logLinesWith("what is not written is lost: 0"), 0U);
  }
  EXPECT_EQ(daemon.process().wait(), 1);
}

TEST_F(HangingSinksTest, ClientsAreServedWhileTheLogHangs) {
  daemon.setEnvironment("TONEWERK_LOG", "debug");
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  {
    const StoppedThread log(daemon.process().identifier(), "tw-log", StoppedThread::WaitsIn::kFutex);
    const std::string before = daemon.log();
    report(client, 1, 1);
    EXPECT_TRUE(waitUntil([&] { return sinkOf(client, "log").integer("hangs") > 0; }));
    EXPECT_EQ(daemon.log(), before);
  }
  EXPECT_TRUE(waitForLogLine("stop called. reporterID=1"));
  EXPECT_EQ(daemon.stop(), 0);
}

// A pipe that nobody reads takes 64 KiB.
class UnreadLogTest : public testing::Test {
 protected:
  UnreadLogTest() {
    EXPECT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    reader = FileDescriptor(::open(pipe.c_str(), O_RDWR | O_CLOEXEC));
    for (const char* name : {"RUNTIME", "STATE", "LOGS", "CONFIGURATION"}) {
      const std::string path = directory.path(name);
      std::filesystem::create_directory(path);
      command.environment[std::string(name) + "_DIRECTORY"] = path;
    }
    command.environment["TONEWERK_LOG"] = "debug";
  }

  TemporaryDirectory directory;
  const std::string pipe = directory.path("log");
  const std::string socket = directory.path("RUNTIME") + "/reporting.sock";
  FileDescriptor reader;
  ChildCommand command{TONEWERK_DAEMON_PATH, {}, {}};
  ChildProcess daemon;
};

TEST_F(UnreadLogTest, StopsNeitherClientsNorTheEnd) {
  ASSERT_TRUE(daemon.start(command, directory.path("output"), pipe));
  ASSERT_TRUE(waitUntil([&] { return std::filesystem::exists(socket); }));
  DaemonClient client(socket);
  for (ReporterID session = 1; session <= 300; ++session) {
    client.create(session, kTest);
    client.start(session);
    client.stop(session);
    client.destroy(session);
  }
  client.disconnect();
  daemon.signal(SIGTERM);
  EXPECT_EQ(daemon.wait(), 0);
}

}  // namespace
}  // namespace tonewerk

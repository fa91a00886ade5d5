// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

#include <cmath>
#include <gtest/gtest.h>
#include <map>
#include <nlohmann/json.hpp>

#include "support/ReportingTest.h"
#include "workers/sinks/TWReportingSessionSummaryWorker.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;
using ::testing::UnorderedElementsAre;

constexpr char kDirectory[] = "/logs/Audio/Reporting";
constexpr char kPath[] = "/logs/Audio/Reporting/20251120-111800+0100-77-Unknown-test.json";

class TWReportingSessionSummaryJsonFileWorkerTest : public ReportingTest {
 protected:
  TWReportingSessionSummaryJsonFileWorkerTest()
      : ReportingTest({&TWReportingSessionSummaryJsonFileWorker::kWorkerClass}) {
    test.clock.setUtcOffset(std::chrono::minutes(60));
    session = makeSession(77);
    session->setServiceType(11);
  }

  void send(const ValueMap& payload, AudioEventCategory category = 4, AudioEventType type = 1) {
    test.clock.advance(1.0);
    ValueMap stamped = payload;
    stamped.set("twreporting_timestamp", test.clock.now());
    session->sendMessage(message(stamped, category, type));
  }

  void stop() {
    test.clock.setNow(ManualClock::kStart);
    session->stop();
    context->fileSinkQueue().drain();
  }

  // The names of the file's entries, in order.
  std::vector<std::string> memberNames(const std::string& path = kPath) {
    std::vector<std::string> names;
    for (const auto& entry : nlohmann::json::parse(test.files.contents(path).value_or("[]"))) {
      EXPECT_EQ(entry.size(), 1U);
      names.push_back(entry.begin().key());
    }
    return names;
  }

  std::shared_ptr<TWReportingSession> session;
};

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, IsNeitherProducerNorConsumer) {
  const auto& workerClass = TWReportingSessionSummaryJsonFileWorker::kWorkerClass;
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.isConsumer);
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, OutsideInternalBuildsOnlyTestSessionsGetAFile) {
  for (int service = 0; service <= 14; ++service) {
    session->setServiceType(static_cast<AudioServiceType>(service));
    EXPECT_EQ(TWReportingSessionSummaryJsonFileWorker::initWithSession(session) != nullptr, service == 11)
        << service;
  }
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, OnInternalBuildsEverySessionGetsAFile) {
  makeInternalBuild();
  for (int service = 0; service <= 14; ++service) {
    session->setServiceType(static_cast<AudioServiceType>(service));
    const auto worker = TWReportingSessionSummaryJsonFileWorker::initWithSession(session);
    ASSERT_NE(worker, nullptr);
    EXPECT_TRUE(worker->started);
  }
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, WritesAnArrayOfOneMemberObjectsLineByLine) {
  session->start();
  send({{"a", 1}});
  stop();
  EXPECT_THAT(test.files.files(), ElementsAre(kPath));
  const std::string text = test.files.contents(kPath).value();
  std::vector<std::string> lines;
  for (std::size_t at = 0; at < text.size(); at = text.find('\n', at) + 1) {
    lines.push_back(text.substr(at, text.find('\n', at) - at));
  }
  EXPECT_EQ(lines.front(), "[");
  EXPECT_EQ(lines[1], "{");  // each object takes several indented lines
  EXPECT_THAT(lines[2], HasSubstr("\"Setup_Start_1\": {"));
  EXPECT_EQ(std::count(lines.begin(), lines.end(), ","), 2);
  EXPECT_EQ(lines.back(), "]");
  EXPECT_EQ(text.back(), '\n');
  EXPECT_THAT(memberNames(), ElementsAre("Setup_Start_1", "Setup_Stop_1", "Playback_Start_1"));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, CountsEachCategoryAndTypeFromOne) {
  session->start();
  send({{"a", 1}}, 14, 0);
  send({{"a", 2}}, 14, 0);
  send({{"a", 3}}, 14, 0);
  send({{"a", 1}}, 14, 1);
  stop();
  EXPECT_THAT(memberNames(), ElementsAre("Setup_Start_1", "Setup_Stop_1", "Volume_Generic_1",
                                         "Volume_Generic_2", "Volume_Generic_3", "Volume_Start_1"));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, TwoCategoriesOfOneTextShareACount) {
  session->start();
  send({{"a", 1}}, 0x00030001, 0);
  send({{"a", 1}}, 0x01000001, 0);
  stop();
  EXPECT_THAT(memberNames(),
              ElementsAre("Setup_Start_1", "Setup_Stop_1", "_Generic_Generic_1", "_Generic_Generic_2"));
}

// Stops after the file's worker, and sees the stored messages as that left them.
class LaterWorker final : public TWReportingSessionWorkerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit LaterWorker(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  void stop() override {
    for (const auto& stored : session.lock()->messages()) {
      seen[stored->message.text("a")] = stored->message.text("isSessionStarted");
    }
  }

  std::map<std::string, std::string> seen;  // by what the message says under "a"
};
const TWReportingSessionWorkerClass LaterWorker::kWorkerClass = workerClassOf<LaterWorker>("LaterWorker");

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, EachPayloadSaysWhetherItsSessionWasStarted) {
  useWorkers({&TWReportingSessionSummaryJsonFileWorker::kWorkerClass, &LaterWorker::kWorkerClass});
  session = makeSession(77);
  session->setServiceType(11);
  session->sendMessage(message({{"a", "before"}}));
  session->start();
  session->sendMessage(message({{"a", "after"}}));
  const auto later = std::dynamic_pointer_cast<LaterWorker>(session->messageWorkers().back());
  stop();
  EXPECT_EQ(later->seen["before"], "NO");  // in the stored messages themselves
  EXPECT_EQ(later->seen["after"], "YES");
  EXPECT_THAT(test.files.contents(kPath).value(), HasSubstr("\"isSessionStarted\": \"YES\""));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, ContainsTheMessagesOfTheProducers) {
  useWorkers({&TWReportingSessionSummaryWorker::kWorkerClass,
              &TWReportingSessionSummaryJsonFileWorker::kWorkerClass});
  session = makeSession(77);
  session->setServiceType(11);
  session->start();
  stop();
  EXPECT_THAT(memberNames(), ElementsAre("Setup_Start_1", "Setup_Stop_1", "Session_Generic_Summary_1"));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, MakesItsDirectoryAccessibleToAllUsers) {
  session->start();
  stop();
  EXPECT_EQ(test.files.directoryMode(kDirectory), 0777U);
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, NamesTheFileByTimeIdentifierApplicationAndService) {
  const ValueMap configuration{{"HostApplicationDisplayID", "my app"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  session->setServiceType(7);
  EXPECT_EQ(TWReportingSessionSummaryJsonFileWorker::fileNameFor(*session),
            "20251120-111800+0100-77-my app-longformaudio.json");
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, ANameThatWouldLeaveTheDirectoryFailsAndIsLogged) {
  const ValueMap configuration{{"HostApplicationDisplayID", "../../evil"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  session->start();
  stop();
  EXPECT_THAT(test.files.files(), IsEmpty());
  EXPECT_THAT(
      test.log.textsOf("twru", LogLevel::kError),
      ElementsAre(StartsWith("SummaryJsonFileWorker failed to open file. action=open file=" +
                             std::string(kDirectory) + "/20251120-111800+0100-77-../../evil-test.json")));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, EachStopWritesAFileOfItsOwn) {
  session->start();
  stop();
  session->start();
  test.clock.advance(1.0);
  session->stop();
  context->fileSinkQueue().drain();
  EXPECT_THAT(test.files.files(), SizeIs(2));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, AFileThatCannotBeWrittenIsCountedAsDropped) {
  session->start();
  send({{"run", "first"}});
  test.files.failPlace(std::errc::no_space_on_device);
  stop();
  EXPECT_THAT(test.files.files(), IsEmpty());
  EXPECT_EQ(context->fileSinkQueue().status().dropped, 1U);
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, ANewFileDrivesOutTheOldestOnes) {
  EXPECT_FALSE(test.preferences.write("com.orvane.tonewerk.twreporting", "summary_megabytes", 1));
  const std::string old = std::string(kDirectory) + "/20200101-000000+0000-1-Unknown-test.json";
  test.files.addFile(old, std::string(2U << 20U, 'x'), -1.0);
  session->start();
  stop();
  EXPECT_THAT(test.files.files(), ElementsAre(kPath));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, TheDaemonsStartRemovesWhatAnEarlierOneLeftUnfinished) {
  TWReportingSessionSummaryJsonFileWorker::tidyDirectory();
  context->fileSinkQueue().drain();
  EXPECT_THAT(test.files.swept(), ElementsAre(kDirectory));
}

// Once, the second file replaced the first.
TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, StopsWithinOneSecondWriteFilesWithNumbers) {
  for (const char* run : {"first", "second", "third"}) {
    session->start();
    send({{"run", run}});
    stop();
  }
  const std::string stem = std::string(kPath).substr(0, std::string(kPath).size() - 5);
  EXPECT_THAT(test.files.files(), UnorderedElementsAre(kPath, stem + "-2.json", stem + "-3.json"));
  EXPECT_THAT(test.files.contents(kPath).value(), HasSubstr("\"first\""));
  EXPECT_THAT(test.files.contents(stem + "-2.json").value(), HasSubstr("\"second\""));
  EXPECT_THAT(test.files.contents(stem + "-3.json").value(), HasSubstr("\"third\""));
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kInfo),
              Contains("SummaryJsonFileWorker closed file. action=close file=" + stem + "-3.json"));
}

// A producer after which only redundant messages are left.
class RedundantOnly final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit RedundantOnly(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  void stop() override {
    for (const auto& record : session.lock()->messages()) record->isRedundant = true;
  }
};
const TWReportingSessionWorkerClass RedundantOnly::kWorkerClass =
    workerClassOf<RedundantOnly>("RedundantOnly");

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest,
       WithOnlyRedundantMessagesNoFileIsWrittenButTheClosingIsLogged) {
  useWorkers({&RedundantOnly::kWorkerClass, &TWReportingSessionSummaryJsonFileWorker::kWorkerClass});
  session = makeSession(77);
  session->setServiceType(11);
  session->start();
  stop();
  EXPECT_THAT(test.files.files(), IsEmpty());
  EXPECT_EQ(test.files.directoryMode(kDirectory), std::nullopt);
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kInfo),
              ElementsAre("SummaryJsonFileWorker closed file. action=close file=(null)"));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, LogsOpeningAndClosing) {
  session->start();
  stop();
  EXPECT_THAT(test.log.textsOf("twru"),
              ElementsAre("SummaryJsonFileWorker opened file. action=open file=" + std::string(kPath),
                          "SummaryJsonFileWorker closed file. action=close file=" + std::string(kPath)));
  EXPECT_THAT(test.log.linesOf("twru", LogLevel::kInfo), SizeIs(2));
  EXPECT_EQ(test.files.openFiles(), 0);
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest,
       ADirectoryThatCannotBeMadeIsLoggedAndTheFileTriedAllTheSame) {
  test.files.failCreateDirectories(std::errc::permission_denied);
  session->start();
  stop();
  const auto errors = test.log.textsOf("twru", LogLevel::kError);
  ASSERT_THAT(errors, SizeIs(2));
  EXPECT_EQ(errors[0], "can't create logging directory at " + std::string(kDirectory) + ": " +
                           std::make_error_code(std::errc::permission_denied).message());
  EXPECT_THAT(errors[1], StartsWith("SummaryJsonFileWorker failed to open file."));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, AFileThatCannotBeOpenedIsLoggedOnceAndTheSessionLivesOn) {
  test.files.failCreateFile(std::errc::no_space_on_device);
  session->start();
  send({{"a", 1}});
  stop();
  EXPECT_THAT(
      test.log.textsOf("twru", LogLevel::kError),
      ElementsAre("SummaryJsonFileWorker failed to open file. action=open file=" + std::string(kPath) +
                  " error=\"" + std::make_error_code(std::errc::no_space_on_device).message() + "\""));
  test.files.failCreateFile(std::errc());
  session->start();
  stop();
  EXPECT_THAT(test.files.files(), ElementsAre(kPath));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, OnlyAFailureAtTheEndOfALineIsLogged) {
  const std::string line =
      "SummaryJsonFileWorker failed to write line. action=writeline file=" + std::string(kPath);
  test.files.failWrite(1, std::errc::no_space_on_device);  // the text of the first line
  session->start();
  stop();
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError), Not(Contains(StartsWith(line))));

  test.files.failWrite(2, std::errc::no_space_on_device);  // the end of the line
  session->start();
  stop();
  EXPECT_THAT(
      test.log.textsOf("twru", LogLevel::kError),
      Contains(line + " error=\"" + std::make_error_code(std::errc::no_space_on_device).message() + "\""));
}

// Once, a full disk left half a file under the final name.
TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, AnIncompleteFileDoesNotAppearAndItsClosingLogsWhy) {
  for (const int nth : {1, 2, 5}) {
    test.files.failWrite(nth, std::errc::no_space_on_device);
    session->start();
    stop();
    EXPECT_THAT(test.files.files(), IsEmpty());
    EXPECT_EQ(test.log.textsOf("twru", LogLevel::kError).back(),
              "SummaryJsonFileWorker failed to closed file. action=close file=" + std::string(kPath) +
                  " error=\"" + std::make_error_code(std::errc::no_space_on_device).message() + "\"");
  }
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, AFailedCloseIsLogged) {
  test.files.failPlace(std::errc::io_error);
  session->start();
  stop();
  EXPECT_THAT(
      test.log.textsOf("twru", LogLevel::kError),
      ElementsAre("SummaryJsonFileWorker failed to closed file. action=close file=" + std::string(kPath) +
                  " error=\"" + std::make_error_code(std::errc::io_error).message() + "\""));
  EXPECT_EQ(test.files.openFiles(), 0);
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, APayloadThatIsNotValidJsonLeavesAnEmptyEntryAndIsLogged) {
  session->start();
  send({{"bad", std::nan("")}});
  stop();
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError), ElementsAre(StartsWith("dataWithJSONObject: ")));
  EXPECT_THAT(test.files.contents(kPath).value(), HasSubstr("}\n\n]\n"));
  EXPECT_THAT(memberNames(), ElementsAre("Setup_Start_1", "Setup_Stop_1"));
}

TEST_F(TWReportingSessionSummaryJsonFileWorkerTest, TheFileIsWrittenOffTheWorkQueue) {
  session->start();
  session->stop();
  EXPECT_THAT(test.files.files(), IsEmpty());
  context->fileSinkQueue().drain();
  EXPECT_THAT(test.files.files(), SizeIs(1));
}

}  // namespace
}  // namespace tonewerk

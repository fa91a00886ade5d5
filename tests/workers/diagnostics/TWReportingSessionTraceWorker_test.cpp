// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionTraceWorker.h"

#include <cerrno>
#include <gmock/gmock.h>

#include "platform/Heartbeat.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

constexpr char kProbes[] = "/etc/probes.json";
constexpr char kTrace[] = "/traces/1";
constexpr char kFile[] = "/logs/Audio/Traces/20251120-111800+0100-tonewerk-Unknown-test.bdj";
constexpr char kStartTimeout[] = "timed out waiting for performance trace to start";
constexpr char kStopTimeout[] =
    "timed out waiting for performance trace to stop.  No bdj file wil be generated. ";

class TWReportingSessionTraceWorkerTest : public ReportingTest {
 protected:
  using Runtrace = MemoryRuntrace;

  TWReportingSessionTraceWorkerTest() : ReportingTest({&TWReportingSessionTraceWorker::kWorkerClass}) {
    makeInternalBuild();
    test.clock.setUtcOffset(std::chrono::minutes(60));
    test.files.addFile(kProbes, R"([{"name": "decode", "type": "interval"}])");
    test.files.addFile(kTrace, "");
    static_cast<void>(test.files.createDirectories("/tmp", 01777));
    test.kolvi.intervals["decode"] = {1500, 250};
    session = makeSession(77);
    session->setServiceType(11);
    configure({{"TWReportingKolviPlistFilePath", kProbes}});
  }

  void configure(const ValueMap& configuration) {
    EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  }
  void useProbes(const std::string& json) { test.files.addFile(kProbes, json); }

  TWReportingSessionWorkerProtocol& worker() { return *session->messageWorkers().at(0); }
  std::vector<std::string> errors() const { return test.log.textsOf("twrt", LogLevel::kError); }
  // Returns the log lines of all levels.
  std::vector<std::string> lines() const { return test.log.textsOf("twrt"); }
  std::chrono::nanoseconds elapsed() const { return test.clock.monotonic(); }
  std::string benchfile(const std::string& path = kFile) const {
    return test.files.contents(path).value_or("no file");
  }

  std::shared_ptr<TWReportingSession> session;
};

TEST_F(TWReportingSessionTraceWorkerTest, IsNeitherProducerNorConsumer) {
  const auto& workerClass = TWReportingSessionTraceWorker::kWorkerClass;
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_FALSE(workerClass.handleSingleMessageSession);
}

TEST_F(TWReportingSessionTraceWorkerTest, TracesATestSessionAndWritesItsIntervalsInMilliseconds) {
  session->start();
  EXPECT_TRUE(worker().started);
  EXPECT_EQ(test.runtrace.record(0).starts, 1);
  EXPECT_EQ(test.runtrace.record(0).stops, 0);
  session->stop();
  EXPECT_EQ(test.runtrace.record(0).stops, 1);
  EXPECT_EQ(benchfile(), "TWReporting 4\ndecode 1.5\ndecode 0.25\n");
  EXPECT_FALSE(test.files.exists("/tmp/temp_benchfile.bdj"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, TracesTheProbeListWithoutCompressingTheTrace) {
  session->start();
  EXPECT_EQ(test.runtrace.record(0).configuration.probeListPath, kProbes);
  EXPECT_FALSE(test.runtrace.record(0).configuration.compressesFinishedTrace);
}

TEST_F(TWReportingSessionTraceWorkerTest, ASessionOfAnyOtherServiceTypeNeverTraces) {
  for (int service = 0; service <= 14; ++service) {
    if (service == 11) continue;
    session->setServiceType(static_cast<AudioServiceType>(service));
    session->start();
    EXPECT_FALSE(worker().started) << service;
    session->stop();
  }
  session->setServiceType(65535);
  session->start();
  EXPECT_FALSE(worker().started);
  EXPECT_EQ(test.runtrace.count(), 0U);
  EXPECT_THAT(lines(), IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, ASessionOnABuildThatIsNotInternalNeverTraces) {
  test.deviceFacts.set("InternalBuild", false);
  useWorkers({&TWReportingSessionTraceWorker::kWorkerClass});
  session = makeSession(77);
  session->setServiceType(11);
  configure({{"TWReportingKolviPlistFilePath", kProbes}});
  session->start();
  EXPECT_FALSE(worker().started);
  session->stop();
  EXPECT_EQ(test.runtrace.count(), 0U);
  EXPECT_THAT(lines(), IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, AMissingProbeFileIsLoggedAndLeavesTheWorkerNotStarted) {
  configure({{"TWReportingKolviPlistFilePath", "/etc/none.json"}});
  session->start();
  EXPECT_FALSE(worker().started);
  EXPECT_EQ(test.runtrace.count(), 0U);
  EXPECT_THAT(errors(), ElementsAre("Could not start Runtrace. TWReportingKolviPlistFilePath: /etc/none.json "
                                    "is not a valid path"));
}

TEST_F(TWReportingSessionTraceWorkerTest, AConfigurationWithoutAProbeFileIsLikeAMissingOne) {
  session = makeSession(78);
  session->setServiceType(11);
  session->start();
  EXPECT_FALSE(worker().started);
  EXPECT_THAT(errors(), ElementsAre("Could not start Runtrace. TWReportingKolviPlistFilePath: (null) is not "
                                    "a valid path"));
}

TEST_F(TWReportingSessionTraceWorkerTest, AWorkerThatDidNotStartMayTraceAtALaterStart) {
  configure({{"TWReportingKolviPlistFilePath", "/etc/none.json"}});
  session->start();
  session->stop();
  configure({{"TWReportingKolviPlistFilePath", kProbes}});
  session->start();
  EXPECT_TRUE(worker().started);
}

// Waiting for the start.

TEST_F(TWReportingSessionTraceWorkerTest, WaitsForTheStartAtMost15Seconds) {
  test.runtrace.onStart({Runtrace::didStart().after(15s)});
  session->start();
  EXPECT_TRUE(worker().started);
  EXPECT_EQ(elapsed(), 15s);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, AStartThatComesTooLateStopsTheTraceAndLeavesTheWorkerNotStarted) {
  test.runtrace.onStart({Runtrace::didStart().after(15s + 1ns)});
  test.runtrace.onStop({});
  session->start();
  EXPECT_FALSE(worker().started);
  EXPECT_EQ(elapsed(), 15s);
  EXPECT_THAT(errors(), ElementsAre(kStartTimeout));
  EXPECT_EQ(test.runtrace.record(0).stops, 1);
}

TEST_F(TWReportingSessionTraceWorkerTest, AStartThatNeverComesMakesNoFile) {
  test.runtrace.onStart({});
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre(kStartTimeout));
  EXPECT_EQ(test.runtrace.record(0).stops, 1);  // the stop after the timeout
  EXPECT_EQ(benchfile(), "no file");
}

TEST_F(TWReportingSessionTraceWorkerTest, ATraceThatIsNoLongerValidIsNotStoppedAfterTheTimeOut) {
  // A stop that fails without a request drops the trace session and signals nothing.
  test.runtrace.onStart({Runtrace::didStop("gone").after(1s)});
  session->start();
  EXPECT_EQ(elapsed(), 15s);
  EXPECT_FALSE(worker().started);
  EXPECT_EQ(test.runtrace.record(0).stops, 0);
  EXPECT_THAT(errors(), ElementsAre("runtraceDidStop gone", kStartTimeout));
}

TEST_F(TWReportingSessionTraceWorkerTest, AfterAStartThatTimedOutTheSessionDoesNotTraceAgain) {
  test.runtrace.onStart({});
  session->start();
  session->stop();
  test.runtrace.onStart({Runtrace::didStart()});
  session->start();
  EXPECT_FALSE(worker().started);
  EXPECT_EQ(test.runtrace.count(), 1U);
}

TEST_F(TWReportingSessionTraceWorkerTest, CallbacksAfterAStartThatTimedOutDoNoHarm) {
  test.runtrace.onStart({Runtrace::didStart().after(20s)});
  test.runtrace.onStop({Runtrace::didComplete(kTrace).after(30s)});
  session->start();
  test.clock.advance(60.0);
  EXPECT_THAT(test.log.textsOf("twrt", LogLevel::kInfo),
              ElementsAre("Performance Trace Started", "Performance Trace Completed: /traces/1"));
  session->stop();
  EXPECT_EQ(benchfile(), "no file");
  EXPECT_FALSE(test.runtrace.record(0).isAlive);
}

TEST_F(TWReportingSessionTraceWorkerTest, AFailedStartCountsAsStartedButHasNothingToStop) {
  test.runtrace.onStart({Runtrace::didStart("no session daemon")});
  session->start();
  EXPECT_TRUE(worker().started);
  EXPECT_THAT(errors(), ElementsAre("runtraceDidStart no session daemon"));
  EXPECT_FALSE(test.runtrace.record(0).isAlive);
  session->stop();
  EXPECT_EQ(elapsed(), 0s);
  EXPECT_EQ(test.runtrace.record(0).stops, 0);
  EXPECT_EQ(benchfile(), "no file");
  EXPECT_THAT(errors(), SizeIs(1));
}

TEST_F(TWReportingSessionTraceWorkerTest, ASecondStartCallbackDoesNotEndTheWaitForTheStop) {
  test.runtrace.onStart({Runtrace::didStart(), Runtrace::didStart()});
  test.runtrace.onStop({Runtrace::didStop(), Runtrace::didComplete(kTrace).after(10s)});
  session->start();
  session->stop();
  EXPECT_EQ(elapsed(), 10s);
  EXPECT_NE(benchfile("/logs/Audio/Traces/20251120-111810+0100-tonewerk-Unknown-test.bdj"), "no file");
}

// Waiting for the stop.

TEST_F(TWReportingSessionTraceWorkerTest, WaitsForTheCompletionAtMost180Seconds) {
  test.runtrace.onStop({Runtrace::didStop().after(1s), Runtrace::didComplete(kTrace).after(180s)});
  session->start();
  session->stop();
  EXPECT_EQ(elapsed(), 180s);
  EXPECT_THAT(errors(), IsEmpty());
  EXPECT_EQ(benchfile("/logs/Audio/Traces/20251120-112100+0100-tonewerk-Unknown-test.bdj"),
            "TWReporting 4\ndecode 1.5\ndecode 0.25\n");
}

TEST_F(TWReportingSessionTraceWorkerTest, ACompletionThatComesTooLateMakesNoFile) {
  test.runtrace.onStop({Runtrace::didStop(), Runtrace::didComplete(kTrace).after(180s + 1ns)});
  session->start();
  session->stop();
  EXPECT_EQ(elapsed(), 180s);
  EXPECT_THAT(errors(), ElementsAre(kStopTimeout));
  test.clock.advance(1.0);
  EXPECT_THAT(lines(), Contains("Performance Trace Completed: /traces/1"));
  EXPECT_THAT(test.kolvi.opened, IsEmpty());
  EXPECT_THAT(test.files.files(), ElementsAre(kProbes, kTrace));
}

TEST_F(TWReportingSessionTraceWorkerTest, TheStopCallbackAloneDoesNotEndTheWait) {
  test.runtrace.onStop({Runtrace::didStop()});
  session->start();
  session->stop();
  EXPECT_EQ(elapsed(), 180s);
  EXPECT_THAT(lines(), ElementsAre("Performance Trace Started", "Performance Trace Stopped", kStopTimeout));
  EXPECT_THAT(test.log.textsOf("twrt", LogLevel::kInfo), SizeIs(2));
}

TEST_F(TWReportingSessionTraceWorkerTest, AFailedStopIsLoggedAndStillWaitsForTheCompletion) {
  test.runtrace.onStop({Runtrace::didStop("disk full")});
  session->start();
  session->stop();
  EXPECT_EQ(elapsed(), 180s);
  EXPECT_THAT(errors(), ElementsAre("runtraceDidStop disk full", kStopTimeout));
  EXPECT_FALSE(test.runtrace.record(0).isAlive);
}

TEST_F(TWReportingSessionTraceWorkerTest, AFailedCompletionIsLoggedAndLeavesNoTraceToProcess) {
  test.runtrace.onStop({Runtrace::didStop(), Runtrace::didFailToComplete("events were lost")});
  session->start();
  session->stop();
  EXPECT_EQ(elapsed(), 0s);
  EXPECT_THAT(errors(),
              ElementsAre("runtraceDidComplete events were lost", "No traceResults at path: (null)"));
  EXPECT_THAT(lines(), Contains("Starting Kolvi Process Trace. Path: (null)"));
  EXPECT_EQ(benchfile(), "no file");
  EXPECT_FALSE(test.runtrace.record(0).isAlive);
}

TEST_F(TWReportingSessionTraceWorkerTest, ATraceThatEndsByItselfHasNothingToStop) {
  session->start();
  EXPECT_TRUE(test.runtrace.callBack(0, Runtrace::didFailToComplete("the session daemon ended")));
  session->stop();
  EXPECT_EQ(elapsed(), 0s);
  EXPECT_EQ(test.runtrace.record(0).stops, 0);
  EXPECT_THAT(errors(), ElementsAre("runtraceDidComplete the session daemon ended"));
}

TEST_F(TWReportingSessionTraceWorkerTest, ASecondCompletionIsIgnored) {
  test.runtrace.onStop({Runtrace::didComplete(kTrace), Runtrace::didComplete("/traces/2")});
  session->start();
  session->stop();
  EXPECT_THAT(test.kolvi.opened, ElementsAre(kTrace));
  EXPECT_THAT(lines(), Not(Contains("Performance Trace Completed: /traces/2")));
}

TEST_F(TWReportingSessionTraceWorkerTest, TheFinishedTraceIsKeptNoLongerThanItIsNeeded) {
  session->start();
  EXPECT_TRUE(test.runtrace.callBack(0, Runtrace::didComplete(kTrace)));
  EXPECT_FALSE(test.runtrace.record(0).token.expired());
  session->stop();
  session->start();  // replaces the run that ended by itself
  EXPECT_TRUE(test.runtrace.record(0).token.expired());
  session->stop();
  EXPECT_NE(benchfile(), "no file");
  EXPECT_TRUE(test.runtrace.record(1).token.expired());
}

TEST_F(TWReportingSessionTraceWorkerTest, ASessionStartedAgainTracesAgain) {
  session->start();
  session->stop();
  test.clock.advance(1.0);
  test.kolvi.intervals["decode"] = {3000};
  session->start();
  EXPECT_TRUE(worker().started);
  session->stop();
  EXPECT_EQ(test.runtrace.count(), 2U);
  EXPECT_EQ(benchfile("/logs/Audio/Traces/20251120-111801+0100-tonewerk-Unknown-test.bdj"),
            "TWReporting 4\ndecode 3\n");
}

TEST_F(TWReportingSessionTraceWorkerTest, TheFileSaysWhoseItIsAndWhenTheIntervalsBegan) {
  test.kolvi.beginTime = 1763633880.5;
  session->start();
  session->stop();
  EXPECT_EQ(benchfile(), "TWReporting 4\ndecode 1.5 at 1763633880.5\ndecode 0.25 at 1763633880.5\n");
  EXPECT_EQ(test.benchfile.reporterID, 77);
}

// The worker must not take the completion of an earlier run for the one that it waits for.
TEST_F(TWReportingSessionTraceWorkerTest, ALateCallbackOfAnEarlierRunDoesNotChangeThisOne) {
  test.runtrace.onStop({});
  session->start();
  session->stop();
  session->start();
  EXPECT_FALSE(test.runtrace.callBack(0, Runtrace::didComplete("/traces/old")));
  test.runtrace.onStop({Runtrace::didComplete(kTrace).after(5s)});
  const auto before = elapsed();
  session->stop();
  EXPECT_EQ(elapsed() - before, 5s);
  EXPECT_THAT(test.kolvi.opened, ElementsAre(kTrace));
}

TEST_F(TWReportingSessionTraceWorkerTest, ACallbackAfterTheWorkerHasEndedDoesNothing) {
  session->start();
  session.reset();
  EXPECT_FALSE(test.runtrace.record(0).isAlive);
  test.log.clear();
  EXPECT_FALSE(test.runtrace.callBack(0, Runtrace::didComplete(kTrace)));
  EXPECT_THAT(lines(), IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, AServiceTypeThatChangesDuringTheTraceLeavesItUnprocessed) {
  session->start();
  session->setServiceType(7);
  session->stop();
  EXPECT_EQ(test.runtrace.record(0).stops, 0);
  EXPECT_EQ(benchfile(), "no file");
}

// Processing the trace.

TEST_F(TWReportingSessionTraceWorkerTest, LogsItsSteps) {
  session->start();
  session->stop();
  EXPECT_THAT(
      lines(),
      ElementsAre("Performance Trace Started", "Performance Trace Stopped",
                  "Performance Trace Completed: /traces/1", "Starting Kolvi Process Trace. Path: /traces/1",
                  "tempWriterPath: /tmp/temp_benchfile.bdj", "interval probe \"decode\", decode",
                  "name:decode time:1.500000 ms", "name:decode time:0.250000 ms",
                  "Moving file from tempWriterPath: /tmp/temp_benchfile.bdj to " + std::string(kFile)));
  EXPECT_THAT(test.log.textsOf("twrt", LogLevel::kInfo), SizeIs(3));
  EXPECT_THAT(test.log.textsOf("twrt", LogLevel::kDebug), SizeIs(6));
}

TEST_F(TWReportingSessionTraceWorkerTest, AMissingTraceEndsTheProcessing) {
  test.runtrace.onStop({Runtrace::didComplete("/traces/none")});
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("No traceResults at path: /traces/none"));
  EXPECT_THAT(test.kolvi.opened, IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, ASingleDictionaryIsAListOfOne) {
  useProbes(R"({"name": "Decoding", "type": "interval", "signpost": "decode"})");
  session->start();
  session->stop();
  EXPECT_EQ(benchfile(), "TWReporting 4\nDecoding 1.5\nDecoding 0.25\n");
}

TEST_F(TWReportingSessionTraceWorkerTest, ChildrenComeBeforeTheirParentDepthFirst) {
  useProbes(R"([{"name": "a", "type": "interval", "children": [
                  {"name": "b", "type": "interval", "children": [{"name": "c", "type": "interval"}]},
                  {"name": "d", "type": "interval"}]},
                {"name": "group", "children": [{"name": "e", "type": "interval"}]}])");
  for (const char* name : {"a", "b", "c", "d", "e", "group"}) test.kolvi.intervals[name] = {1000};
  session->start();
  session->stop();
  EXPECT_EQ(benchfile(), "TWReporting 4\nc 1\nb 1\nd 1\na 1\ne 1\n");
  EXPECT_THAT(lines(), Contains("probe \"group\", group"));
}

TEST_F(TWReportingSessionTraceWorkerTest, AnyOtherRootIsUnsupported) {
  const std::pair<const char*, const char*> kinds[] = {
      {"\"text\"", "string"}, {"true", "boolean"}, {"1", "integer"}, {"1.5", "double"}};
  for (const auto& kind : kinds) {
    test.log.clear();
    useProbes(kind.first);
    session->start();
    session->stop();
    EXPECT_THAT(errors(),
                ElementsAre("unsupported root class " + std::string(kind.second),
                            "TWReportingSessionTraceWorker failed to get KolviProbes from /etc/probes.json"));
  }
  EXPECT_THAT(test.kolvi.opened, IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, AProbeListThatIsEmptyOrNotJsonEndsTheProcessing) {
  for (const char* text : {"[]", "", "{", "null"}) {
    test.log.clear();
    useProbes(text);
    session->start();
    session->stop();
    EXPECT_THAT(errors(), ElementsAre("TWReportingSessionTraceWorker failed to get KolviProbes from "
                                      "/etc/probes.json"))
        << text;
  }
  EXPECT_THAT(test.kolvi.opened, IsEmpty());
}

TEST_F(TWReportingSessionTraceWorkerTest, AProbeListThatCannotBeReadEndsTheProcessing) {
  session->start();
  test.files.failReadFile(std::errc::permission_denied);
  session->stop();
  EXPECT_THAT(errors(),
              ElementsAre("TWReportingSessionTraceWorker failed to get KolviProbes from /etc/probes.json"));
}

TEST_F(TWReportingSessionTraceWorkerTest, ATraceThatDoesNotOpenEndsTheProcessing) {
  test.kolvi.failure = "12 events were lost";
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("failed to create Kolvi model: 12 events were lost"));
  EXPECT_EQ(benchfile(), "no file");
}

// The benchmark data file.

TEST_F(TWReportingSessionTraceWorkerTest, MakesItsDirectoryWritableForEveryUser) {
  session->start();
  session->stop();
  EXPECT_EQ(test.files.directoryMode("/logs/Audio/Traces"), 0777U);
}

TEST_F(TWReportingSessionTraceWorkerTest, NamesTheFileByTimeProjectApplicationAndService) {
  configure({{"HostApplicationDisplayID", "my app"}});
  session->start();
  session->stop();
  EXPECT_NE(benchfile("/logs/Audio/Traces/20251120-111800+0100-tonewerk-my app-test.bdj"), "no file");
}

TEST_F(TWReportingSessionTraceWorkerTest, TheConfigurationChoosesTheFilesNameAndDirectory) {
  configure({{"TWReportingKolviOutputFileName", "run.bdj"}, {"TWReportingKolviOutputFileDirectory", "/out"}});
  session->start();
  session->stop();
  EXPECT_NE(benchfile("/out/run.bdj"), "no file");
  EXPECT_EQ(test.files.directoryMode("/logs/Audio/Traces"), std::nullopt);
}

TEST_F(TWReportingSessionTraceWorkerTest, ADirectoryThatCannotBeMadeIsLoggedAndTheFileIsStillTried) {
  test.files.failCreateDirectories(std::errc::permission_denied);
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("can't create logging directory at /logs/Audio/Traces: " +
                                        std::make_error_code(std::errc::permission_denied).message(),
                                    "Failed to move file"));
}

TEST_F(TWReportingSessionTraceWorkerTest, AnExistingFileIsAFailureToMove) {
  test.files.addFile(kFile, "earlier");
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("Failed to move file"));
  EXPECT_EQ(benchfile(), "earlier");
}

TEST_F(TWReportingSessionTraceWorkerTest, ANameThatWouldLeaveTheDirectoryIsAFailureToMove) {
  configure({{"TWReportingKolviOutputFileName", "../evil.bdj"}});
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("Failed to move file"));
  EXPECT_FALSE(test.files.exists("/logs/Audio/evil.bdj"));
  EXPECT_FALSE(test.files.exists("/logs/Audio/Traces/../evil.bdj"));
}

TEST_F(TWReportingSessionTraceWorkerTest, AWriterThatDoesNotOpenIsLoggedWithTheSystemsErrorNumber) {
  test.benchfile.openFailure = ENOSPC;
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("Failed to open benchfile writer. errno: " + std::to_string(ENOSPC),
                                    "Failed to move file"));
  EXPECT_THAT(lines(), Contains("name:decode time:1.500000 ms"));
}

TEST_F(TWReportingSessionTraceWorkerTest, AFileThatLostItsValuesIsNotMovedIntoPlace) {
  test.benchfile.closeFailure = std::errc::no_space_on_device;
  session->start();
  session->stop();
  EXPECT_THAT(errors(), ElementsAre("Failed to close benchfile writer: " +
                                    std::make_error_code(std::errc::no_space_on_device).message()));
  EXPECT_EQ(benchfile(), "no file");
}

TEST_F(TWReportingSessionTraceWorkerTest, AProbeWithoutIntervalsAddsNothing) {
  test.kolvi.intervals.clear();
  session->start();
  session->stop();
  EXPECT_EQ(benchfile(), "TWReporting 4\n");
}

TEST_F(TWReportingSessionTraceWorkerTest, WaitingForTheTraceIsLongWorkOfTheTimeout) {
  test.runtrace.onStart({Runtrace::didStart().after(10s)});
  test.runtrace.onStop({Runtrace::didComplete(kTrace).after(100s)});
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread scope(heartbeat);
  std::chrono::milliseconds allowance{0};
  const auto timer = test.timers.repeat(1s, [&] { allowance = heartbeat->read().allowance; });
  session->start();
  EXPECT_EQ(allowance, 15s);
  session->stop();
  EXPECT_EQ(allowance, 180s);
  EXPECT_EQ(heartbeat->read().allowance, 0s);
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
//
// Measures what a session's stop costs for each stored message: the whole stop, with and without the JSON
// file, and each part alone. The file is written by the daemon's own adapters; everything else is in memory.
// The column `a_message` is processor time of the benchmark's thread, divided by the stored messages.

#include <algorithm>
#include <benchmark/benchmark.h>
#include <cstdint>
#include <filesystem>
#include <iterator>
#include <memory>
#include <stdexcept>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "QuietDoubles.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "session/MessageShapes.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "support/TemporaryDirectory.h"
#include "support/TestPlatform.h"
#include "values/PackedMap.h"
#include "workers/TWReportingWorkerClasses.h"
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"
#include "workers/producers/TWReportingSessionInputMessagesWorker.h"
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"
#include "workers/sinks/RtcSummary.h"
#include "workers/sinks/SummaryJsonFile.h"
#include "workers/sinks/TWReportingSessionRtcWorker.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

namespace tonewerk {
namespace {

constexpr std::size_t kStored = 100'000;
constexpr AudioEventCategory kPlayback = 4;
constexpr AudioServiceType kTest = 11;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr std::size_t kUnbounded = std::size_t{1} << 40;
constexpr double kMinimumSeconds = 0.5;

// Describes a playing stream as the ingest benchmark's messages do. As in a connection, the messages are
// packed, and those of one kind share a shape. Every `changeEvery`th message has another volume, and the
// message after it is one of a head tracker; 0 for never.
class Stream {
 public:
  Stream(std::size_t changeEvery, ShapeTable& shapes) : changeEvery_(changeEvery), shapes_(shapes) {}

  std::vector<ValueMap> payloads(std::size_t count) {
    std::vector<ValueMap> payloads;
    payloads.reserve(count);
    for (std::size_t at = 0; at < count; ++at) payloads.push_back(payload(at));
    return payloads;
  }

  std::vector<std::shared_ptr<TWReportingSessionMessage>> records(std::size_t count) {
    std::vector<std::shared_ptr<TWReportingSessionMessage>> records;
    records.reserve(count);
    for (ValueMap& payload : payloads(count)) {
      records.push_back(std::make_shared<TWReportingSessionMessage>(std::move(payload), kPlayback, 0));
    }
    return records;
  }

 private:
  ValueMap payload(std::size_t at) {
    const double time = start_ + static_cast<double>(at) * 0.02;
    if (changeEvery_ != 0 && at % changeEvery_ == 0) volume_ = volume_ == 0.4375 ? 0.5 : 0.4375;
    if (changeEvery_ != 0 && at % changeEvery_ == 1)
      return packed({{"twreporting_timestamp", time}, {"spatializationEnabled", at % 2 == 0}});
    return packed({{"twreporting_timestamp", time},
                   {"session_output_running", true},
                   {"session_selected_format", "48000 Hz, 2 ch, Float32, interleaved"},
                   {"active_devices", "Speaker"},
                   {"mFormatID", "lpcm"},
                   {"mChannelsPerFrame", 2},
                   {"QMSessionVolume", volume_},
                   {"position", at}});
  }

  ValueMap packed(const std::vector<ValueMapEntry>& entries) {
    ShapeTable::Place place = ShapeTable::root();
    std::string values;
    for (const ValueMapEntry& entry : entries) {
      place = shapes_.next(place, entry.key);
      if (!appendEncoded(values, entry.value)) throw std::invalid_argument("a value cannot be packed");
    }
    return ValueMap(PackedMap::make(*shapes_.shapeAt(place), values));
  }

  const std::size_t changeEvery_;
  ShapeTable& shapes_;
  const double start_ = RunningClock().now();
  double volume_ = 0.4375;
};

class Core {
 public:
  explicit Core(bool hasFile = true) : context_(platform(), classes(hasFile)) {}

  std::shared_ptr<TWReportingSession> makeSession(AudioServiceType serviceType) {
    auto session = TWReportingSession::initWithID(77, {4711}, std::make_shared<KeptBytesBudget>(kUnbounded),
                                                  makeMessageShapes());
    session->setServiceType(serviceType);
    const ValueMap configuration{{"HostApplicationDisplayID", "com.example.player"}};
    (void)session->updateConfigurationWithContentsOfConfiguration(&configuration);
    session->start();
    return session;
  }

  std::shared_ptr<TWReportingSession> makeFullSession(AudioServiceType serviceType, std::size_t changeEvery) {
    auto session = makeSession(serviceType);
    for (auto& record : Stream(changeEvery, *session->shapes()).records(kStored)) {
      session->sendMessage(record);
      record.reset();
    }
    return session;
  }

  // Records with the payloads of a full session.
  TWReportingSessionMessages makeFullRecords() {
    const auto session = makeFullSession(kTest, 0);
    TWReportingSessionMessages records;
    records.reserve(session->messages().size());
    for (const auto* message : session->messages()) records.push_back(message->copyWithZone());
    return records;
  }

  std::size_t filesWritten() const {
    const std::string path = directory_.path("Audio/Reporting");
    std::error_code error;
    const std::filesystem::directory_iterator files(path, error);
    return error ? 0 : static_cast<std::size_t>(std::distance(begin(files), end(files)));
  }
  void removeFiles() const { std::filesystem::remove_all(directory_.path("Audio")); }
  const std::string& directory() const { return directory_.path(); }

 private:
  static std::vector<const TWReportingSessionWorkerClass*> classes(bool hasFile) {
    auto classes = allWorkerClasses();
    if (!hasFile) std::erase(classes, &TWReportingSessionSummaryJsonFileWorker::kWorkerClass);
    return classes;
  }

  Platform platform() {
    return {.log = log_,
            .accounts = doubles_.accounts,
            .tracePoints = tracePoints_,
            .clock = clock_,
            .queues = queues_,
            .timers = doubles_.timers,
            .semaphores = doubles_.semaphores,
            .processes = doubles_.processes,
            .system = doubles_.system,
            .deviceFacts = doubles_.deviceFacts,
            .preferences = doubles_.preferences,
            .notifications = doubles_.notifications,
            .files = files_,
            .json = json_,
            .metricon = metricon_,
            .energybook = doubles_.energybook,
            .diagwire = doubles_.diagwire,
            .linkReport = linkReport_,
            .capsa = doubles_.capsa,
            .runtrace = doubles_.runtrace,
            .kolvi = doubles_.kolvi,
            .benchfile = doubles_.benchfile,
            .issueDrafts = doubles_.issueDrafts,
            .whirlcaps = doubles_.whirlcaps,
            .chanmeter = doubles_.chanmeter,
            .commands = doubles_.commands,
            .threads = doubles_.threads,
            .logsDirectory = directory_.path(),
            .temporaryDirectory = directory_.path()};
  }

  const TemporaryDirectory directory_;
  TestPlatform doubles_;
  QuietLog log_;
  SilentTracePoints tracePoints_;
  RunningClock clock_;
  ImmediateQueues queues_;
  CountingMetricon metricon_;
  QuietLinkReport linkReport_;
  LinuxFileSystem files_;
  NlohmannJsonService json_;
  TWReportingContext context_;
};

void reportTimeOfAMessage(benchmark::State& state, std::size_t messages = kStored) {
  state.counters["a_message"] =
      benchmark::Counter(static_cast<double>(messages),
                         benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// The whole stop. Each iteration stops a new session.
void stop(benchmark::State& state, AudioServiceType serviceType, bool hasFile) {
  Core core(hasFile);
  for (auto _ : state) {
    state.PauseTiming();
    const auto session = core.makeFullSession(serviceType, static_cast<std::size_t>(state.range(0)));
    if (session->messages().size() < kStored) state.SkipWithError("messages were not stored");
    state.ResumeTiming();
    session->stop();
    state.PauseTiming();
    if ((core.filesWritten() == 1) != hasFile) state.SkipWithError("the wrong number of files");
    core.removeFiles();
    state.ResumeTiming();
  }
  reportTimeOfAMessage(state);
}
void StopWithoutFile(benchmark::State& state) { stop(state, kTest, false); }
void StopWithFile(benchmark::State& state) { stop(state, kTest, true); }
// With the worker for real-time communication, which has a summary of all texts.
void StopWithCallRecords(benchmark::State& state) { stop(state, kLongFormAudio, false); }

#define TONEWERK_CHANGES ArgName("change_every")->Arg(0)->Arg(50)->Unit(benchmark::kMillisecond)
BENCHMARK(StopWithoutFile)->TONEWERK_CHANGES;
BENCHMARK(StopWithFile)->TONEWERK_CHANGES;
BENCHMARK(StopWithCallRecords)->TONEWERK_CHANGES;

// The parts.

void SortInOrder(benchmark::State& state) {
  Core core;
  TWReportingSessionMessages messages = core.makeFullRecords();
  for (auto _ : state) TWReportingSessionMessage::sortMessages(messages);
  reportTimeOfAMessage(state);
}
BENCHMARK(SortInOrder)->Unit(benchmark::kMillisecond);

// One message in ten comes as late as twenty others.
void SortLate(benchmark::State& state) {
  Core core;
  TWReportingSessionMessages late = core.makeFullRecords();
  for (std::size_t at = 0; at + 20 < late.size(); at += 10) std::swap(late[at], late[at + 20]);
  for (auto _ : state) {
    state.PauseTiming();
    TWReportingSessionMessages messages = late;
    state.ResumeTiming();
    TWReportingSessionMessage::sortMessages(messages);
    benchmark::DoNotOptimize(messages.data());
  }
  reportTimeOfAMessage(state);
}
BENCHMARK(SortLate)->Unit(benchmark::kMillisecond);

// Sessions whose messages are walked again and again: the first walk merges rapid messages, all walks merge
// nothing new.
template <typename Walk>
void walk(benchmark::State& state, Walk summariesOf) {
  Core core(false);
  const auto session = core.makeFullSession(kTest, static_cast<std::size_t>(state.range(0)));
  for (auto _ : state) {
    TWReportingSessionMessages summaries = summariesOf(session, session->messages());
    benchmark::DoNotOptimize(summaries.data());
  }
  reportTimeOfAMessage(state);
}

void VolumeWalk(benchmark::State& state) {
  walk(state, [](const auto& session, const auto& messages) {
    const SharedString process("com.example.player");
    return TWReportingSessionVolumeMessagesWorker(session).createVolumeMessages(messages, &process,
                                                                                kMinimumSeconds);
  });
}
void InputWalk(benchmark::State& state) {
  walk(state, [](const auto& session, const auto& messages) {
    const SharedString process("com.example.player");
    return TWReportingSessionInputMessagesWorker(session).createInputMessages(messages, &process,
                                                                              kMinimumSeconds);
  });
}
void GatherWalk(benchmark::State& state) {
  walk(state, [](const auto& session, const auto& messages) {
    return TWReportingSessionGatherMessagesWorker(session).createGatherMessages(messages, kMinimumSeconds);
  });
}
BENCHMARK(VolumeWalk)->TONEWERK_CHANGES;
BENCHMARK(InputWalk)->TONEWERK_CHANGES;
BENCHMARK(GatherWalk)->TONEWERK_CHANGES;

// The file alone, with the kernel's work for it.
void WriteFile(benchmark::State& state) {
  Core core;
  const TWReportingSessionMessages messages = core.makeFullRecords();
  for (auto _ : state) {
    SummaryJsonFile file(core.directory(), "stop.json");
    for (const auto& message : messages)
      file.writeMessage(message->category, message->type, message->message);
    const bool isWritten = file.closeFile();
    state.PauseTiming();
    if (!isWritten || !std::filesystem::remove(core.directory() + "/stop.json")) {
      state.SkipWithError("no file was written");
    }
    state.ResumeTiming();
  }
  reportTimeOfAMessage(state);
}
BENCHMARK(WriteFile)->Unit(benchmark::kMillisecond);

void CallRecordsSummary(benchmark::State& state) {
  Core core;
  const TWReportingSessionMessages messages = core.makeFullRecords();
  for (auto _ : state) {
    const ValueMap summary =
        rtcSummaryOf(messages, kLongFormAudio, TWReportingSessionRtcWorker::kWorkerClass);
    if (summary.size() < 8) state.SkipWithError("keys are missing in the summary");
  }
  reportTimeOfAMessage(state);
}
BENCHMARK(CallRecordsSummary)->Unit(benchmark::kMillisecond);

void FreeMessages(benchmark::State& state) {
  Core core(false);
  for (auto _ : state) {
    state.PauseTiming();
    KeptMessages messages;
    for (const auto& record : core.makeFullRecords()) messages.add(*record);
    state.ResumeTiming();
    messages.clear();
  }
  reportTimeOfAMessage(state);
}
BENCHMARK(FreeMessages)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace tonewerk

BENCHMARK_MAIN();

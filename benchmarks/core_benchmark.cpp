// SPDX-License-Identifier: Apache-2.0
//
// Measures the cost of a message in the core, without socket and store: the message is normalised, checked
// for redundancy, stored and delivered to every worker of a started session. Shows how the cost grows with
// stored messages, keys and sessions. Also measures the payload's map alone.

#include <benchmark/benchmark.h>
#include <cstdint>
#include <malloc.h>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "QuietDoubles.h"
#include "service/MessageTap.h"
#include "service/TapSubscriber.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "support/TestPlatform.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

constexpr AudioEventCategory kPlayback = 4;
// Records made at a time, outside the measured time.
constexpr std::size_t kBatch = 512;
// Messages that are added to a session before it is replaced by a new one.
constexpr std::size_t kMaxAdded = 16'384;
// The usual limit for a client is 256 MiB. 100,000 messages of 64 keys need more, and messages that are not
// kept would not be measured.
constexpr std::size_t kUnbounded = std::size_t{1} << 40;

class Core {
 public:
  Core()
      : context_(doubles_.platformWith(log_, tracePoints_, clock_, queues_, metricon_, linkReport_),
                 allWorkerClasses()) {}

  std::shared_ptr<TWReportingSession> makeSession(ReporterID reporterID) {
    auto session =
        TWReportingSession::initWithID(reporterID, {4711}, std::make_shared<KeptBytesBudget>(kUnbounded));
    const ValueMap configuration{{"HostApplicationDisplayID", "com.example.player"}};
    (void)session->updateConfigurationWithContentsOfConfiguration(&configuration);
    session->start();
    return session;
  }

  std::uint64_t events() const { return metricon_.events; }

 private:
  TestPlatform doubles_;
  QuietLog log_;
  SilentTracePoints tracePoints_;
  RunningClock clock_;
  ImmediateQueues queues_;
  CountingMetricon metricon_;
  QuietLinkReport linkReport_;
  TWReportingContext context_;
};

using Record = std::shared_ptr<TWReportingSessionMessage>;

// Makes messages of `keys` keys as a connection does: the keys are shared, and each message has its own map.
class Messages {
 public:
  Messages(std::size_t keys, bool isChanging) : isChanging_(isChanging) {
    for (std::size_t at = 2; at < keys; ++at) keys_.emplace_back("some_property_" + std::to_string(at));
  }

  ValueMap payload() {
    ++count_;
    ValueMap payload;
    payload.reserve(keys_.size() + 2);
    payload.set(timeKey_, start_ + static_cast<double>(count_));
    payload.set(positionKey_, isChanging_ ? count_ : 0);
    for (const SharedString& key : keys_) payload.set(key, 48'000);
    return payload;
  }

  std::vector<Record> records(std::size_t count) {
    std::vector<Record> records;
    records.reserve(count);
    for (std::size_t at = 0; at < count; ++at) {
      records.push_back(std::make_shared<TWReportingSessionMessage>(payload(), kPlayback, kTypeGeneric));
    }
    return records;
  }

 private:
  const double start_ = RunningClock().now();
  const SharedString timeKey_{"twreporting_timestamp"};
  const SharedString positionKey_{"position"};
  std::vector<SharedString> keys_;
  const bool isChanging_;
  std::int64_t count_ = 0;
};

void fill(TWReportingSession& session, std::size_t stored, std::size_t keys) {
  Messages messages(keys, true);
  for (const Record& record : messages.records(stored)) session.sendMessage(record);
}

// Sends messages of `keys` keys to a session that stores `stored` messages, and up to kMaxAdded more when the
// sent ones are stored.
void sendMessage(benchmark::State& state, bool isChanging) {
  const auto stored = static_cast<std::size_t>(state.range(0));
  const auto keys = static_cast<std::size_t>(state.range(1));
  Core core;
  auto session = core.makeSession(77);
  fill(*session, stored, keys);
  Messages messages(keys, isChanging);
  session->sendMessage(messages.records(1).front());
  std::vector<Record> records;
  std::size_t next = 0;
  for (auto _ : state) {
    if (next == records.size()) {
      state.PauseTiming();
      if (session->messages().size() > stored + kMaxAdded) {
        session.reset();
        session = core.makeSession(77);
        fill(*session, stored, keys);
      }
      records = messages.records(kBatch);
      next = 0;
      state.ResumeTiming();
    }
    session->sendMessage(records[next++]);
  }
  const std::size_t now = session->messages().size();
  if (!isChanging && now > stored + 3) state.SkipWithError("redundant messages were stored");
  if (core.events() == 0) state.SkipWithError("no worker got a message");
}

void SendChanging(benchmark::State& state) { sendMessage(state, true); }
void SendRedundant(benchmark::State& state) { sendMessage(state, false); }

#define TONEWERK_STORED_AND_KEYS ArgNames({"stored", "keys"})->ArgsProduct({{1, 100, 100'000}, {8, 64}})
BENCHMARK(SendChanging)->TONEWERK_STORED_AND_KEYS;
BENCHMARK(SendRedundant)->TONEWERK_STORED_AND_KEYS;

// Sends one message after the other to the sessions in turn; each session stores only a few.
void SendToSessions(benchmark::State& state) {
  constexpr std::size_t kKeys = 8;
  constexpr std::size_t kMaxMessages = 100'000;
  Core core;
  std::vector<std::shared_ptr<TWReportingSession>> sessions;
  const auto begin = [&] {
    sessions.clear();
    for (std::int64_t at = 0; at < state.range(0); ++at) sessions.push_back(core.makeSession(100 + at));
  };
  begin();
  Messages messages(kKeys, true);
  std::vector<Record> records;
  std::size_t sent = 0;
  for (auto _ : state) {
    if (sent % kBatch == 0) {
      state.PauseTiming();
      if (sent % kMaxMessages < kBatch) begin();
      records = messages.records(kBatch);
      state.ResumeTiming();
    }
    sessions[sent % sessions.size()]->sendMessage(records[sent % kBatch]);
    ++sent;
  }
}
BENCHMARK(SendToSessions)->ArgName("sessions")->Arg(1)->Arg(1000);

// Measures what showing a received message to watchers adds. A watcher that never fetches its messages is
// soon full, and each new message then removes an old one.
void NoteForWatchers(benchmark::State& state) {
  Core core;
  const auto session = core.makeSession(77);
  MessageTap watch;
  std::vector<std::shared_ptr<TapSubscriber>> watchers;
  for (std::int64_t at = 0; at < state.range(0); ++at) {
    watchers.push_back(std::make_shared<TapSubscriber>());
    watchers.back()->open({});
    watch.add(watchers.back());
  }
  const Record record = Messages(8, true).records(1).front();
  for (auto _ : state) watch.note(*session, *record);
  for (const auto& watcher : watchers) {
    if (watcher->waitingMessages() == 0) state.SkipWithError("a watcher got no message");
  }
}
BENCHMARK(NoteForWatchers)->ArgName("watchers")->Arg(0)->Arg(1)->Arg(10);

// Measures the stop of a session by its stored messages: sorting them, and every worker's report. Time per
// stop.
void Stop(benchmark::State& state) {
  const auto stored = static_cast<std::size_t>(state.range(0));
  Core core;
  for (auto _ : state) {
    state.PauseTiming();
    const auto session = core.makeSession(77);
    fill(*session, stored, 8);
    state.ResumeTiming();
    session->stop();
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
  state.SetComplexityN(state.range(0));
}
// Its growth is compared with n log n, which it must not exceed.
BENCHMARK(Stop)
    ->ArgName("stored")
    ->Arg(1000)
    ->Arg(10'000)
    ->Arg(100'000)
    ->Unit(benchmark::kMicrosecond)
    ->Complexity(benchmark::oNLogN);

// Measures the heap memory of a stored message: payload, record and container entries. The time does not
// matter.
void KeepMessages(benchmark::State& state) {
  constexpr std::size_t kStored = 100'000;
  const auto keys = static_cast<std::size_t>(state.range(0));
  Core core;
  for (auto _ : state) {
    const auto session = core.makeSession(77);
    const std::size_t before = mallinfo2().uordblks;
    fill(*session, kStored, keys);
    const std::size_t after = mallinfo2().uordblks;
    state.counters["bytes_a_message"] = static_cast<double>(after - before) / static_cast<double>(kStored);
  }
}
BENCHMARK(KeepMessages)->ArgName("keys")->Arg(8)->Arg(64)->Iterations(1)->Unit(benchmark::kMillisecond);

// The payload's map alone.
void MakePayload(benchmark::State& state) {
  Messages messages(static_cast<std::size_t>(state.range(0)), true);
  for (auto _ : state) benchmark::DoNotOptimize(messages.payload());
}
BENCHMARK(MakePayload)->ArgName("keys")->Arg(8)->Arg(64);

void CopyPayload(benchmark::State& state) {
  const ValueMap payload = Messages(static_cast<std::size_t>(state.range(0)), true).payload();
  for (auto _ : state) {
    ValueMap copy = payload;
    benchmark::DoNotOptimize(copy);
  }
}
BENCHMARK(CopyPayload)->ArgName("keys")->Arg(8)->Arg(64);

void CopyAndChangePayload(benchmark::State& state) {
  const ValueMap payload = Messages(static_cast<std::size_t>(state.range(0)), true).payload();
  const SharedString key("position");
  for (auto _ : state) {
    ValueMap copy = payload;
    copy.set(key, 7);
    benchmark::DoNotOptimize(copy);
  }
}
BENCHMARK(CopyAndChangePayload)->ArgName("keys")->Arg(8)->Arg(64);

void MergePayload(benchmark::State& state) {
  Messages messages(static_cast<std::size_t>(state.range(0)), true);
  ValueMap previous = messages.payload();
  previous.set("another", true);
  const ValueMap payload = messages.payload();
  for (auto _ : state) previous.merge(payload);
}
BENCHMARK(MergePayload)->ArgName("keys")->Arg(8)->Arg(64);

}  // namespace
}  // namespace tonewerk

BENCHMARK_MAIN();

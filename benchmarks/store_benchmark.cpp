// SPDX-License-Identifier: Apache-2.0
//
// Measures the cost of the report store: recording and writing an event, a commit of a single event and the
// bytes that it writes, and reading the events after an identifier. Processor times are those of the
// recording thread and the store's thread together.

#include <benchmark/benchmark.h>
#include <chrono>
#include <cstdint>
#include <fstream>
#include <memory>
#include <string>
#include <time.h>
#include <vector>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/StoreMetricon.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kLongEnough{60};

class QuietLog final : public Log {
 public:
  bool isEnabled(std::string_view, LogLevel) const override { return false; }
  void write(std::string_view, std::string_view, LogLevel, std::string_view) override {}
};

class RunningClock final : public Clock {
 public:
  double now() const override {
    return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  }
  std::chrono::nanoseconds monotonic() const override {
    return std::chrono::steady_clock::now().time_since_epoch();
  }
  std::chrono::minutes utcOffset(double) const override { return {}; }
  void sleep(std::chrono::nanoseconds) override {}
};

// A store in a directory of its own.
class Store {
 public:
  TemporaryDirectory directory;
  QuietLog log;
  LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  RunningClock clock;
  MemoryJsonService json;
  MemoryPreferenceStore preferences;
  Accounts accounts{990, clock};
  ReportStore store{directory.path(), json, preferences, clock, accounts, category};
  StoreMetricon metricon{store, preferences, clock, category};
};

// An event of 12 entries, some 370 bytes of JSON. `n` makes its numbers differ.
ValueMap payload(int n) {
  return {{"category", 4},
          {"type", 1 + n % 7},
          {"HostApplicationDisplayID", "com.example.player"},
          {"device", "Built-in Speaker"},
          {"route", "speaker,default"},
          {"sample_rate", 48000},
          {"channels", 2},
          {"volume", 0.25 + (n % 64) / 256.0},
          {"latency", n % 977},
          {"session", 1'000'000 + n % 10},
          {"timestamp", 1'700'000'000.25 + n},
          {"a_longer_key_for_the_description", std::string(90, 'x')}};
}

std::vector<ValueMap> payloads() {
  constexpr int kCount = 1024;
  std::vector<ValueMap> made;
  made.reserve(kCount);
  for (int n = 0; n < kCount; ++n) made.push_back(payload(n));
  return made;
}

// The names of 20 kinds of events.
std::vector<EventNames> kinds() {
  constexpr int kCount = 20;
  std::vector<EventNames> made;
  made.reserve(kCount);
  for (int kind = 0; kind < kCount; ++kind) {
    const std::string event = "Playback.Kind" + std::to_string(kind);
    made.push_back(
        {SharedString("com.orvane.tonewerk." + event), SharedString("com.orvane.alarms." + event)});
  }
  return made;
}

std::int64_t bytesWritten() {
  std::ifstream file("/proc/self/io");
  std::string key;
  std::int64_t value = 0;
  while (file >> key >> value) {
    if (key == "wchar:") return value;
  }
  return 0;
}

// The processor time of the calling thread.
double threadNanoseconds() {
  timespec time{};
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
  return static_cast<double>(time.tv_sec) * 1e9 + static_cast<double>(time.tv_nsec);
}

// Events through the analytics service, as fast as the store takes them. The counter is the recorder's
// part.
void RecordEvents(benchmark::State& state) {
  Store store;
  const std::vector<ValueMap> events = payloads();
  const std::vector<EventNames> names = kinds();
  std::size_t at = 0;
  const double before = threadNanoseconds();
  for (auto _ : state) {
    const ValueMap& event = events[at % events.size()];
    store.metricon.sendEvent(names[at % names.size()], {}, [&event] { return event; });
    ++at;
    if (at % 65'536 == 0) benchmark::DoNotOptimize(store.store.flush(kLongEnough));
  }
  state.counters["recording"] =
      benchmark::Counter(threadNanoseconds() - before, benchmark::Counter::kAvgIterations);
  benchmark::DoNotOptimize(store.store.flush(kLongEnough));
}
BENCHMARK(RecordEvents)->Iterations(400'000)->MeasureProcessCPUTime()->Unit(benchmark::kNanosecond);

// Events of users who take turns, in groups of 64, while the file stays at a bound of 16 MiB: as much is
// deleted as recorded. The argument is the number of users.
void RecordAtTheBound(benchmark::State& state) {
  Store store;
  store.preferences.configure("com.orvane.tonewerk.store", "max_megabytes", 16);
  const std::vector<ValueMap> events = payloads();
  const std::vector<EventNames> names = kinds();
  std::vector<std::shared_ptr<Account>> users;
  for (std::uint32_t user = 0; user < state.range(0); ++user) users.push_back(store.accounts.of(1001 + user));
  std::size_t at = 0;
  const double before = threadNanoseconds();
  for (auto _ : state) {
    const WorkingFor scope(users[at / 64 % users.size()]);
    const ValueMap& event = events[at % events.size()];
    store.metricon.sendEvent(names[at % names.size()], {}, [&event] { return event; });
    ++at;
    if (at % 65'536 == 0) benchmark::DoNotOptimize(store.store.flush(kLongEnough));
  }
  state.counters["recording"] =
      benchmark::Counter(threadNanoseconds() - before, benchmark::Counter::kAvgIterations);
  benchmark::DoNotOptimize(store.store.flush(kLongEnough));
}
BENCHMARK(RecordAtTheBound)
    ->Arg(1)
    ->Arg(2)
    ->Arg(8)
    ->Iterations(400'000)
    ->MeasureProcessCPUTime()
    ->Unit(benchmark::kNanosecond);

// The first event after a start with a file of about 230 MiB, which is read once.
void OpenAFullStore(benchmark::State& state) {
  Store store;
  const std::vector<ValueMap> events = payloads();
  const std::vector<EventNames> names = kinds();
  const auto record = [&](ReportStore& target, std::size_t at) {
    target.recordEvent(store.clock.now(), names[at % names.size()], events[at % events.size()]);
  };
  for (std::size_t at = 0; at < 550'000; ++at) record(store.store, at);
  if (!store.store.flush(kLongEnough)) state.SkipWithError("not written");
  std::size_t at = 0;
  for (auto _ : state) {
    ReportStore again(store.directory.path(), store.json, store.preferences, store.clock, store.accounts,
                      store.category);
    record(again, at++);
    if (!again.flush(kLongEnough)) state.SkipWithError("not written");
  }
}
BENCHMARK(OpenAFullStore)->Iterations(5)->Unit(benchmark::kMillisecond);

// Events that are real-time-communication messages, too.
void RecordMessages(benchmark::State& state) {
  Store store;
  const std::vector<ValueMap> events = payloads();
  const std::vector<EventNames> names = kinds();
  const auto session = std::make_shared<RtcSessionRecord>();
  std::size_t at = 0;
  const double before = threadNanoseconds();
  for (auto _ : state) {
    const ValueMap& event = events[at % events.size()];
    store.metricon.sendEvent(names[at % names.size()], {}, [&event] { return event; });
    store.store.record(RtcMessageRow{store.clock.now(), session, 4, 1, event, "timestamp"});
    ++at;
    if (at % 65'536 == 0) benchmark::DoNotOptimize(store.store.flush(kLongEnough));
  }
  state.counters["recording"] =
      benchmark::Counter(threadNanoseconds() - before, benchmark::Counter::kAvgIterations);
  benchmark::DoNotOptimize(store.store.flush(kLongEnough));
}
BENCHMARK(RecordMessages)->Iterations(400'000)->MeasureProcessCPUTime()->Unit(benchmark::kNanosecond);

// Events that no consumer asks for.
void RecordUnusedEvents(benchmark::State& state) {
  Store store;
  store.preferences.configure("com.orvane.metricon", "consumers", ValueArray{});
  const std::vector<EventNames> names = kinds();
  std::size_t at = 0;
  for (auto _ : state) store.metricon.sendEvent(names[at++ % names.size()], {}, [] { return ValueMap(); });
}
BENCHMARK(RecordUnusedEvents)->Unit(benchmark::kNanosecond);

// Each event is a transaction of its own.
void CommitOneEvent(benchmark::State& state) {
  Store store;
  const std::vector<ValueMap> events = payloads();
  const std::vector<EventNames> names = kinds();
  (void)store.store.flush(kLongEnough);
  const std::int64_t before = bytesWritten();
  std::size_t at = 0;
  for (auto _ : state) {
    const ValueMap& event = events[at % events.size()];
    store.metricon.sendEvent(names[at % names.size()], {}, [&event] { return event; });
    ++at;
    benchmark::DoNotOptimize(store.store.flush(kLongEnough));
  }
  state.counters["bytes"] =
      benchmark::Counter(static_cast<double>(bytesWritten() - before), benchmark::Counter::kAvgIterations);
}
BENCHMARK(CommitOneEvent)->Iterations(5'000)->MeasureProcessCPUTime()->Unit(benchmark::kMicrosecond);

// The next fifty events after one in the middle of 100,000, as the query asks for them.
void readNext(benchmark::State& state, const std::string& query) {
  Store store;
  const std::vector<ValueMap> events = payloads();
  const std::vector<EventNames> names = kinds();
  for (std::size_t at = 0; at < 50'000; ++at) {
    store.store.recordEvent(store.clock.now(), names[at % names.size()], events[at % events.size()]);
  }
  SqliteDatabase database;
  if (!store.store.flush(kLongEnough) ||
      !database.open(store.directory.path("reports.db"), SqliteDatabase::Mode::kReadOnly, kLongEnough)) {
    state.SkipWithError("no store");
    return;
  }
  SqliteStatement select = database.prepare(query);
  select.bind(1, std::int64_t{50'000});
  for (auto _ : state) {
    std::int64_t rows = 0;
    while (select.step() == SqliteStatement::Step::kRow) ++rows;
    select.reset();
    if (rows != 50) state.SkipWithError("not fifty");
  }
}

void ReadNextFromTheView(benchmark::State& state) {
  readNext(state,
           "SELECT id, recorded_at, name, payload FROM analytics_event WHERE id > ?1 ORDER BY id LIMIT 50");
}
BENCHMARK(ReadNextFromTheView)->Unit(benchmark::kMicrosecond);

// As docs/store.md recommends.
void ReadNextByKey(benchmark::State& state) {
  readNext(state,
           "SELECT r.id * 2 + n.position AS event, r.recorded_at, n.name, r.payload FROM analytics_row AS r"
           " CROSS JOIN analytics_name AS n ON n.name_set = r.name_set"
           " WHERE r.id >= ?1 / 2 AND event > ?1 ORDER BY r.id, n.position LIMIT 50");
}
BENCHMARK(ReadNextByKey)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace tonewerk

BENCHMARK_MAIN();

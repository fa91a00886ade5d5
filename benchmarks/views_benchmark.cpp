// SPDX-License-Identifier: Apache-2.0
//
// Measures the views of a full report store beside reading the file's rows: what a person waits for an
// answer. The store has a month of sessions: 60 messages each, of which every twentieth is an overload, and
// four stretches of playback. The size is the first argument, in MiB (256).

#include <benchmark/benchmark.h>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <memory>
#include <string>
#include <utility>

#include "platform/linux/store/StoreDatabase.h"
#include "protocol/AudioEvent.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

constexpr double kDay = 86'400.0;
constexpr double kMonth = 30 * kDay;
constexpr int kMessages = 60;
constexpr int kStretches = 4;
constexpr double kSessionSeconds = 600.0;

class FullStore {
 public:
  explicit FullStore(std::uintmax_t bytes) {
    // A session is some 28 KiB of rows.
    const auto sessions = static_cast<int>(bytes / 28'000);
    for (int session = 0; size() < bytes; ++session) {
      const double begin = now_ - kMonth + kMonth * session / sessions;
      StoreBatch batch;
      addSession(batch, session, begin < now_ ? begin : now_);
      if (store_.write(batch) != StoreDatabase::Result::kDone) {
        std::cerr << store_.problem() << '\n';
        std::exit(1);
      }
    }
  }

  double now() const { return now_; }
  std::string path() const { return directory_.path("reports.db"); }

 private:
  template <typename Row>
  static void add(StoreBatch& batch, const Row& row) {
    batch.add(row, StoreRowText(row));
  }
  void addSession(StoreBatch& batch, int number, double begin) {
    const std::string application = "org.example.App" + std::to_string(number % 12);
    const auto life = std::make_shared<SessionLife>(
        SessionBeginning{.reporterID = number, .at = begin, .service = "longformaudio"});
    EventSubject subject{.category = kCategoryIo,
                         .type = kTypeGeneric,
                         .source = EventSource::kClient,
                         .life = life,
                         .stretch = {}};
    const double step = kSessionSeconds / kMessages;
    for (int n = 0; n < kMessages; ++n) {
      ValueMap payload{{"route", "speaker,default"}, {"latency", n}, {"note", std::string(150, 'x')}};
      if (n % 20 == 0) {
        payload.set("issue_type", "overload");
        payload.set("smallest_buffer_frame_size", 64 << (n / 20));
      }
      payload.set("HostApplicationDisplayID", application);
      add(batch, AnalyticsRow{begin + step * n,
                              {"com.orvane.tonewerk.IO.Generic", "com.orvane.longformaudio.IO.Generic"},
                              payload,
                              subject});
    }
    subject.category = kCategoryVolume;
    subject.type = kTypeSummary;
    subject.source = EventSource::kDerived;
    for (int n = 0; n < kStretches; ++n) {
      const double length = kSessionSeconds / kStretches;
      subject.stretch = {begin + length * n, begin + length * (n + 1)};
      const ValueMap payload{{"session_selected_format", "48000 Hz, 2 ch, Float32"},
                             {"mFormatID", "lpcm"},
                             {"active_devices", n % 2 == 0 ? "Speaker" : "Headphones"},
                             {"HostApplicationDisplayID", application},
                             {"QMSessionVolume", 0.1 + 0.2 * n},
                             {"QMSessionVolumeBucketed", "0.5"},
                             {"play_seconds", length},
                             {"ringerstate", 0},
                             {"mChannelsPerFrame", 2}};
      add(batch,
          AnalyticsRow{begin + kSessionSeconds,
                       {"com.orvane.tonewerk.Volume.Summary", "com.orvane.longformaudio.Volume.Summary"},
                       payload,
                       subject});
    }
    add(batch, LifeRow{life, application, "player",
                       SessionEnd{.at = begin + kSessionSeconds, .messages = kMessages}});
  }
  std::uintmax_t size() const {
    std::error_code error;
    const std::uintmax_t bytes = std::filesystem::file_size(path(), error);
    return error ? 0 : bytes;
  }

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  ManualClock clock_;
  const double now_ = clock_.now();
  StoreDatabase store_{directory_.path(), json_, clock_};
};

void ask(benchmark::State& state, const std::string& path, const std::string& sql) {
  SqliteDatabase database;
  if (!database.open(path, SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(10))) {
    state.SkipWithError(database.problem().c_str());
    return;
  }
  std::int64_t rows = 0;
  for (auto _ : state) {
    SqliteStatement select = database.prepare(sql);
    SqliteStatement::Step step = SqliteStatement::Step::kFailed;
    for (rows = 0; select && (step = select.step()) == SqliteStatement::Step::kRow; ++rows) {
    }
    if (step != SqliteStatement::Step::kDone) state.SkipWithError(database.problem().c_str());
  }
  state.counters["rows"] = static_cast<double>(rows);
}

void registerQueries(const FullStore& store) {
  const std::string week = std::to_string(store.now() - 7 * kDay);
  const std::string month = std::to_string(store.now() - kMonth);
  const std::string byHour =
      "SELECT strftime('%Y-%m-%d %H', started_at, 'unixepoch'), application, volume_bucket, sum(seconds)"
      " FROM volume_stretch WHERE started_at > ";
  for (const auto& [name, sql] : std::initializer_list<std::pair<const char*, std::string>>{
           {"limit: read all rows", "SELECT count(payload) FROM analytics_row WHERE payload > ''"},
           {"seconds by application, volume and hour, last week", byHour + week + " GROUP BY 1, 2, 3"},
           {"the same, a month", byHour + month + " GROUP BY 1, 2, 3"},
           {"overloads by buffer", "SELECT buffer_frames, count(*) FROM issue GROUP BY 1"},
           {"sessions by application", "SELECT application, count(*), sum(messages) FROM session GROUP BY 1"},
           {"messages of a session",
            "SELECT category, type, count(*) FROM event WHERE session = 9 GROUP BY 1, 2"}}) {
    benchmark::RegisterBenchmark(name, [path = store.path(), sql = sql](benchmark::State& state) {
      ask(state, path, sql);
    })->Unit(benchmark::kMillisecond);
  }
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  const std::uintmax_t megabytes = argc > 1 ? std::strtoull(argv[1], nullptr, 10) : 256;
  const tonewerk::FullStore store(megabytes << 20);
  tonewerk::registerQueries(store);
  benchmark::RunSpecifiedBenchmarks();
}

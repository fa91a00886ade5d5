// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as damage to a report store: the first byte chooses between a file and write-ahead log of a
// daemon that was killed, which the rest of the input changes in places, and a file that is the rest of the
// input. Readers and the writer must survive it; a file that the writer calls damaged can be moved aside, and
// the next one can be written and read.
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>
#include <string_view>

#include "FuzzInput.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreReader.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

using Result = StoreDatabase::Result;

template <typename Row>
void add(StoreBatch& batch, const Row& row) {
  batch.add(row, StoreRowText(row));
}

StoreBatch someRows(int count) {
  StoreBatch batch;
  const auto session = std::make_shared<RtcSessionRecord>();
  session->startedAt = ManualClock::kStart;
  session->userInfo.set("kLinkReportUserInfoServiceName", "telephony_session");
  add(batch, RtcSessionRow{session});
  for (int at = 0; at < count; ++at) {
    const double time = ManualClock::kStart + at;
    const ValueMap payload{{"n", at}, {"text", std::string(40, 'x')}, {"EngineOnDuration", 1.5}};
    add(batch, AnalyticsRow{time, {"com.orvane.audio.volume", ""}, payload});
    add(batch, MetricRow{time, 7, "\x08\x01"});
    add(batch, PowerRow{time, 28, "haptics", payload});
    add(batch, RtcMessageRow{time, session, 4, 1, payload});
    add(batch, SendingRow{{.sentAt = time, .signal = "logs", .records = 1, .bytes = 90, .status = 200},
                          "http://fleet/v1/logs",
                          "slow"});
  }
  return batch;
}

std::string contentsOf(const std::string& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  return text.str();
}

class Store {
 public:
  // The files of a daemon that was killed after it had written.
  struct Files {
    std::string database;
    std::string log;
  };
  Files filesOfAKilledDaemon() {
    StoreDatabase writer(directory_.path(), json_, clock_);
    expect(writer.write(someRows(50)) == Result::kDone && checkpoint() &&
           writer.write(someRows(3)) == Result::kDone);
    return {contentsOf(path_), contentsOf(path_ + "-wal")};
  }

  void put(const Files& files) {
    for (const auto& entry : std::filesystem::directory_iterator(directory_.path())) {
      std::filesystem::remove(entry.path());
    }
    std::ofstream(path_, std::ios::binary) << files.database;
    if (!files.log.empty()) std::ofstream(path_ + "-wal", std::ios::binary) << files.log;
  }

  void read() {
    StoreReader reader;
    if (reader.open(directory_.path()) != StoreReader::Outcome::kDone)
      return expect(!reader.problem().empty());
    for (EventFilter filter : {EventFilter{}, EventFilter{"*session*", 0.0, 4e9, 1, 10}}) {
      check(reader,
            reader.readEvents(filter, [](const StoredEvent& event) { use(event.name, event.payload); }));
      check(reader, reader.readPowerEvents(
                        filter, [](const StoredPowerEvent& event) { use(event.name, event.payload); }));
      check(reader, reader.readEngineOnTotals(
                        filter, [](const EngineOnTotal& total) { use(total.application.value_or(""), ""); }));
      check(reader, reader.readMetrics(filter, [](const StoredMetric&) {}));
      check(reader, reader.readRtcSessions(filter, [](const StoredRtcSession& session) {
        use(session.sessionInfo, session.userInfo);
      }));
      check(reader, reader.readRtcMessages(
                        filter, [](const StoredRtcMessage& message) { use(message.payload, ""); }));
    }
  }

  void write() {
    StoreDatabase writer(directory_.path(), json_, clock_);
    writer.setBounds({1 << 20, 86'400.0});
    const StoreBatch rows = someRows(3);
    bool moreToDo = false;
    Result result = writer.write(rows);
    if (result == Result::kDone) result = writer.trimSize(moreToDo);
    if (result == Result::kDone) result = writer.trimAge(moreToDo);
    if (result == Result::kDone) result = writer.write(rows);
    if (result != Result::kDone) expect(!writer.problem().empty());
    if (result != Result::kCorrupt) return;
    expect(writer.beginAnew() && writer.write(rows) == Result::kDone);
    StoreReader reader;
    std::size_t events = 0;
    expect(reader.open(directory_.path()) == StoreReader::Outcome::kDone);
    // Salvaged ones come first.
    expect(reader.readEvents({}, [&](const StoredEvent&) { ++events; }) && events >= 3);
  }

 private:
  // Moves what is written so far from the log into the file.
  bool checkpoint() {
    SqliteDatabase database;
    return database.open(path_, SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(1)) &&
           database.run("PRAGMA wal_checkpoint(TRUNCATE)");
  }
  static void check(const StoreReader& reader, bool isDone) { expect(isDone || !reader.problem().empty()); }
  static void use(const std::string& text, const std::string& other) {
    expect(isUtf8(text) && isUtf8(other));
  }

  const TemporaryDirectory directory_;
  const std::string path_ = directory_.path(std::string(kStoreFileName));
  const MemoryJsonService json_{};
  const ManualClock clock_;
};

// Changes a file as the input says: bytes in a place, a part that was never written, an end that is missing.
void damage(std::string& file, FuzzInput& input) {
  if (file.empty()) return;
  const std::size_t place = input.number<std::uint32_t>() % file.size();
  switch (input.below(4)) {
    case 0:
      return file.resize(place);
    case 1:
      std::fill_n(file.begin() + static_cast<std::ptrdiff_t>(place),
                  std::min<std::size_t>(file.size() - place, 512), '\0');
      return;
    default: {
      const std::string_view bytes = input.shortText().substr(0, file.size() - place);
      file.replace(place, bytes.size(), bytes);
    }
  }
}

void run(FuzzInput input) {
  static Store store;
  static const Store::Files whole = store.filesOfAKilledDaemon();
  Store::Files files;
  if (input.below(2) == 0) {
    files = whole;
    while (!input.empty()) damage(input.below(2) == 0 ? files.database : files.log, input);
  } else {
    files.database = input.rest();
  }
  store.put(files);
  store.read();
  store.put(files);
  store.write();
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::run({data, size});
  return 0;
}

// SPDX-License-Identifier: Apache-2.0
//
// Measures what the journal costs for each request: records of 200 bytes, 64 for each write, beside copying
// the same bytes and beside a bare write of them. Also measures reading, which every start does.

#include <benchmark/benchmark.h>
#include <cstdint>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <string>
#include <unistd.h>

#include "platform/Log.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/journal/Crc32c.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

constexpr std::size_t kRecordBytes = 200;
constexpr std::size_t kBatch = 64;
constexpr std::size_t kWholeBytes = kRecordHeadBytes + kRecordBytes;

class JournalOnDisk {
 public:
  SegmentJournal& journal() { return *journal_; }
  void append() { journal_->append(Journal::Kind::kRequest, {1'763'633'880.0, 7, 1001}, bytes_); }
  void restart() {
    journal_.reset();
    journal_ = std::make_unique<SegmentJournal>(directory_.path("journal"), preferences_, category_);
  }
  std::string path(const std::string& name) const { return directory_.path(name); }

 private:
  TemporaryDirectory directory_;
  MemoryPreferenceStore preferences_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  const std::string bytes_ = std::string(kRecordBytes, 'x');
  std::unique_ptr<SegmentJournal> journal_ =
      std::make_unique<SegmentJournal>(directory_.path("journal"), preferences_, category_);
};

void finishRecords(benchmark::State& state, std::int64_t perIteration) {
  state.SetItemsProcessed(state.iterations() * perIteration);
}

// Time for each record, which is copied and not written.
void Append(benchmark::State& state) {
  JournalOnDisk disk;
  std::size_t waiting = 0;
  for (auto _ : state) {
    disk.append();
    if (++waiting < kBatch) continue;
    state.PauseTiming();
    waiting = 0;
    if (!disk.journal().write()) state.SkipWithError("not written");
    disk.journal().drop(disk.journal().last());
    state.ResumeTiming();
  }
  finishRecords(state, 1);
}
BENCHMARK(Append)->Unit(benchmark::kNanosecond);

// Time for each batch, in the kernel when it ends.
void AppendAndWrite(benchmark::State& state) {
  JournalOnDisk disk;
  for (auto _ : state) {
    for (std::size_t at = 0; at < kBatch; ++at) disk.append();
    if (!disk.journal().write()) state.SkipWithError("not written");
    disk.journal().drop(disk.journal().last());
  }
  finishRecords(state, kBatch);
}
BENCHMARK(AppendAndWrite)->Unit(benchmark::kNanosecond);

// The same bytes in a buffer, for comparison.
void Copy(benchmark::State& state) {
  const std::string record(kWholeBytes, 'x');
  std::string buffer(kBatch * kWholeBytes, '\0');
  for (auto _ : state) {
    for (std::size_t at = 0; at < kBatch; ++at) {
      std::memcpy(buffer.data() + at * kWholeBytes, record.data(), kWholeBytes);
      benchmark::ClobberMemory();
    }
  }
  finishRecords(state, kBatch);
}
BENCHMARK(Copy)->Unit(benchmark::kNanosecond);

// The same bytes with one call, in files of 4 MiB, for comparison.
void BareWrite(benchmark::State& state) {
  const JournalOnDisk disk;
  const std::string batch(kBatch * kWholeBytes, 'x');
  const std::string path = disk.path("bare");
  FileDescriptor file;
  std::size_t written = kMaxSegmentBytes;
  for (auto _ : state) {
    if (written + batch.size() > kMaxSegmentBytes) {
      ::unlink(path.c_str());
      file = FileDescriptor(::open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
      written = 0;
    }
    if (::write(file.get(), batch.data(), batch.size()) < 0) state.SkipWithError("not written");
    written += batch.size();
  }
  finishRecords(state, kBatch);
}
BENCHMARK(BareWrite)->Unit(benchmark::kNanosecond);

void Checksum(benchmark::State& state) {
  const std::string bytes(static_cast<std::size_t>(state.range(0)), 'x');
  for (auto _ : state) benchmark::DoNotOptimize(crc32c(bytes));
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) * state.range(0));
}
BENCHMARK(Checksum)->ArgName("bytes")->Arg(40)->Arg(200)->Arg(1 << 20)->Unit(benchmark::kNanosecond);

// A start with a journal of 64 MiB.
void ReadAFullJournal(benchmark::State& state) {
  constexpr std::size_t kRecords = (std::size_t{64} << 20) / kWholeBytes;
  JournalOnDisk disk;
  for (std::size_t at = 0; at < kRecords; ++at) {
    disk.append();
    if (at % kBatch == 0 && !disk.journal().write()) state.SkipWithError("not written");
  }
  if (!disk.journal().write()) state.SkipWithError("not written");
  for (auto _ : state) {
    disk.restart();
    const Journal::Reading reading = disk.journal().read([](const Journal::Record&) { return true; });
    if (reading.records != kRecords) state.SkipWithError("not all were read");
  }
  finishRecords(state, kRecords);
}
BENCHMARK(ReadAFullJournal)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace tonewerk

BENCHMARK_MAIN();

// SPDX-License-Identifier: Apache-2.0
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <tuple>
#include <vector>

#include "platform/linux/store/FaultyVfs.h"
#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using Fault = FaultyVfs::Fault;

constexpr std::chrono::seconds kLongEnough{30};
constexpr double kDay = 86'400.0;

// The life of a store, of which any operation on files may fail. What fails is tried again, as the store's
// thread does it.
class StoreLife {
 public:
  StoreLife(const std::string& directory, FaultyVfs& vfs)
      : directory_(directory), vfs_(vfs), store_(std::make_unique<StoreDatabase>(directory, json_, clock_)) {}

  void run() {
    store_->setBounds({.bytes = 3 << 18, .seconds = 30 * kDay});
    for (int batch = 0; batch < 3; ++batch) record(20, 1000);
    clock_.advance(31 * kDay);
    oldest_ = count_;  // they are to go
    record(10, 1000);
    trim();
    reopen();
    record(2, 30'000);
    record(30, 3000);
    trim();
    for (int batch = 0; batch < 3; ++batch) record(1, 100);
    store_.reset();
    vfs_.heal();
  }

  // Everything that was acknowledged and that is young enough is there once, in its order.
  void expectAll() {
    SqliteDatabase file;
    ASSERT_TRUE(file.open(directory_ + "/reports.db", SqliteDatabase::Mode::kReadWrite, kLongEnough));
    EXPECT_THAT(rowsOf(file, "PRAGMA integrity_check"), ElementsAre("ok"));
    for (const std::string table : {"power_event", "analytics_row"}) {
      const auto first = file.number("SELECT min(payload ->> 'n') FROM " + table);
      const auto last = file.number("SELECT max(payload ->> 'n') FROM " + table);
      const auto count = file.number("SELECT count(*) FROM " + table);
      EXPECT_EQ(first, oldest_) << table;
      EXPECT_EQ(last, count_ - 1) << table;
      EXPECT_EQ(count, count_ - oldest_) << table;
      EXPECT_EQ(file.number("SELECT count(DISTINCT payload ->> 'n') FROM " + table), count) << table;
    }
    EXPECT_EQ(file.number("SELECT count(*) FROM analytics_event"), count_ - oldest_);
    EXPECT_FALSE(std::filesystem::exists(directory_ + "/reports.db.corrupt"));
  }
  // The next daemon can use the file.
  void expectToGoOn() {
    StoreDatabase next(directory_, json_, clock_);
    StoreBatch batch;
    const PowerRow row{clock_.now(), 28, "power", {{"n", count_}}};
    batch.add(row, StoreRowText(row));
    EXPECT_EQ(next.write(batch), StoreDatabase::Result::kDone) << next.problem();
  }

 private:
  // A disk that is broken for good works again after the second try.
  void untilDone(const std::function<StoreDatabase::Result()>& act) {
    for (int tries = 0; tries < 4; ++tries) {
      const StoreDatabase::Result result = act();
      ASSERT_NE(result, StoreDatabase::Result::kCorrupt) << store_->problem();
      if (result == StoreDatabase::Result::kDone) return;
      if (tries == 1) vfs_.heal();
    }
    FAIL() << store_->problem();
  }
  void record(int rows, std::size_t bytes) {
    StoreBatch batch;
    for (int n = count_; n < count_ + rows; ++n) {
      const ValueMap payload{{"n", n}, {"text", std::string(bytes, 'x')}};
      const AnalyticsRow event{clock_.now(), "name " + std::to_string(n / 25), payload};
      batch.add(event, StoreRowText(event));
      const PowerRow power{clock_.now(), 28, "power", {{"n", n}}};
      batch.add(power, StoreRowText(power));
    }
    count_ += rows;
    untilDone([&] { return store_->write(batch); });
  }
  void trim() {
    for (bool moreToDo = true; moreToDo;) {
      moreToDo = false;
      untilDone([&] {
        const StoreDatabase::Result result = store_->trimSize(moreToDo);
        return result == StoreDatabase::Result::kDone ? store_->trimAge(moreToDo) : result;
      });
      untilDone([&] { return store_->write({}); });  // it opens the file again after a failure
      if (testing::Test::HasFatalFailure()) return;
    }
  }
  void reopen() {
    store_.reset();
    store_ = std::make_unique<StoreDatabase>(directory_, json_, clock_);
    store_->setBounds({.bytes = 3 << 18, .seconds = 30 * kDay});
  }

  const std::string directory_;
  FaultyVfs& vfs_;
  MemoryJsonService json_;
  ManualClock clock_;
  int count_ = 0;
  int oldest_ = 0;
  std::unique_ptr<StoreDatabase> store_;
};

class StoreFaultsTest : public testing::TestWithParam<std::tuple<Fault, bool>> {};

std::string nameOf(const testing::TestParamInfo<std::tuple<Fault, bool>>& info) {
  static constexpr const char* kNames[] = {"IoError", "DiskFull", "ShortWrite"};
  return std::string(kNames[static_cast<int>(std::get<0>(info.param))]) +
         (std::get<1>(info.param) ? "ForAWhile" : "Once");
}

INSTANTIATE_TEST_SUITE_P(
    Store, StoreFaultsTest,
    testing::Combine(testing::Values(Fault::kIoError, Fault::kDiskFull, Fault::kShortWrite), testing::Bool()),
    nameOf);

TEST_P(StoreFaultsTest, WhicheverOperationFailsNothingAcknowledgedIsMissing) {
  const auto [fault, forGood] = GetParam();
  int failed = 0;
  for (int number = 1;; ++number) {
    SCOPED_TRACE("operation " + std::to_string(number));
    const TemporaryDirectory directory;
    FaultyVfs vfs;
    StoreLife life(directory.path(), vfs);
    vfs.failAt(number, fault, forGood);
    life.run();
    const bool isOver = vfs.operations() < number;
    life.expectAll();
    life.expectToGoOn();
    if (HasFailure() || isOver) break;
    ++failed;
  }
  EXPECT_GT(failed, 100);
}

}  // namespace
}  // namespace tonewerk

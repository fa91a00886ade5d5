// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/StoreTrimmer.h"

#include <algorithm>
#include <string>

#include "platform/linux/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kMinWalBytes = 256 << 10;
constexpr std::int64_t kMaxWalBytes = 8 << 20;

// Rows of each table that one statement deletes, and how many such rounds make a slice.
constexpr std::int64_t kChunkRows = 500;
constexpr int kRoundsPerSlice = 16;
// Pages that a slice gives back.
constexpr std::int64_t kVacuumPages = 512;
// Fewer free pages than this are left for new rows in any case.
constexpr std::int64_t kSpareFreePages = 64;

// Oldest by identifier, which the clock cannot turn round. The newest row stays, so that its identifier is
// not given out again: a reader that goes on behind the last one it saw misses nothing.
std::string oldestChunk(const StoreTable& table, const std::string& columns) {
  const std::string name(table.name);
  return "SELECT " + columns + " FROM " + name + " WHERE id < (SELECT max(id) FROM " + name +
         ") ORDER BY id LIMIT " + std::to_string(kChunkRows);
}

}  // namespace

std::int64_t StoreBounds::walBytes() const { return std::clamp(bytes / 8, kMinWalBytes, kMaxWalBytes); }

StoreTrimmer::Outcome StoreTrimmer::trimAge(const StoreBounds& bounds, double now) {
  for (int round = 0; round < kRoundsPerSlice; ++round) {
    const std::int64_t deleted = deleteUpTo(now - bounds.seconds);
    if (deleted < 0) return Outcome::kFailed;
    if (deleted == 0) return Outcome::kDone;
  }
  return Outcome::kMoreToDo;
}

StoreTrimmer::Outcome StoreTrimmer::trimSize(const StoreBounds& bounds) {
  const Outcome outcome = deleteForSize(bounds.fileBytes());
  return outcome == Outcome::kDone ? vacuum(bounds.fileBytes()) : outcome;
}

StoreTrimmer::Outcome StoreTrimmer::deleteForSize(std::int64_t fileBytes) {
  // What is deleted in one go makes room for a while: a 16th of the file.
  const std::int64_t high = fileBytes - fileBytes / 16;
  const std::int64_t low = high - fileBytes / 16;
  for (int round = 0; round < kRoundsPerSlice; ++round) {
    if (!measure()) return Outcome::kFailed;
    const std::int64_t used = (pages_ - freePages_) * pageBytes_;
    shrinking_ = used > (shrinking_ ? low : high);
    if (!shrinking_) return Outcome::kDone;
    double end = 0.0;
    bool found = false;
    if (!findChunkEnd(end, found)) return Outcome::kFailed;
    if (!found) return Outcome::kDone;  // nothing left to delete
    if (deleteUpTo(end) < 0) return Outcome::kFailed;
  }
  return Outcome::kMoreToDo;
}

StoreTrimmer::Outcome StoreTrimmer::vacuum(std::int64_t fileBytes) {
  if (!measure()) return Outcome::kFailed;
  // Moving pages costs writes, so free ones stay for new rows unless the file is too large or mostly empty.
  const std::int64_t spare = std::max(pages_ / 4, kSpareFreePages);
  const std::int64_t over = pages_ - fileBytes / pageBytes_;
  const std::int64_t wanted = std::min(freePages_, std::max(freePages_ - spare, over));
  if (wanted <= 0) return Outcome::kDone;
  const std::int64_t pages = std::min(wanted, kVacuumPages);
  if (!database_.run("PRAGMA incremental_vacuum(" + std::to_string(pages) + ")")) return Outcome::kFailed;
  if (pages < wanted) return Outcome::kMoreToDo;
  // The file itself only gets shorter with a checkpoint. One that a reader holds up is made later, by SQLite.
  database_.run("PRAGMA wal_checkpoint(PASSIVE)");
  return Outcome::kDone;
}

bool StoreTrimmer::measure() {
  const auto size = database_.number("PRAGMA page_size");
  const auto pages = database_.number("PRAGMA page_count");
  const auto freePages = database_.number("PRAGMA freelist_count");
  if (!size || !pages || !freePages) return false;
  pageBytes_ = *size;
  pages_ = *pages;
  freePages_ = *freePages;
  return true;
}

// Deletes what is not younger than `time` of the oldest chunk of every table. The number of rows, negative on
// failure.
std::int64_t StoreTrimmer::deleteUpTo(double time) {
  std::int64_t deleted = 0;
  for (const StoreTable& table : kStoreTables) {
    SqliteStatement statement =
        database_.prepare("DELETE FROM " + std::string(table.name) + " WHERE " + std::string(table.time) +
                          " <= ?1 AND id IN (" + oldestChunk(table, "id") + ")");
    statement.bind(1, time);
    if (!statement.run()) return -1;
    deleted += database_.changes();
  }
  return deleted;
}

// The time up to which the oldest chunk of one table, the one with the oldest, can be deleted whole.
bool StoreTrimmer::findChunkEnd(double& end, bool& found) {
  found = false;
  for (const StoreTable& table : kStoreTables) {
    SqliteStatement statement = database_.prepare(
        "SELECT max(time) FROM (" + oldestChunk(table, std::string(table.time) + " AS time") + ")");
    if (statement.step() != SqliteStatement::Step::kRow) return false;
    if (statement.isNull(0)) continue;
    end = found ? std::min(end, statement.number(0)) : statement.number(0);
    found = true;
  }
  return true;
}

}  // namespace tonewerk

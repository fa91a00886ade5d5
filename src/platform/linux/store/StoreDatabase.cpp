// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreDatabase.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <string_view>
#include <sys/stat.h>
#include <system_error>
#include <utility>

#include "platform/Clock.h"
#include "platform/linux/store/StoreFloors.h"
#include "platform/linux/store/StoreSalvage.h"
#include "platform/linux/store/StoreSchema.h"
#include "platform/linux/store/StoreViews.h"

namespace tonewerk {
namespace {

// How long a statement waits for another writer's lock. Readers take none.
constexpr std::chrono::milliseconds kPatience{500};
// What is being saved of a damaged file.
constexpr std::string_view kSalvaging = ".salvaging";
// What was saved of it, complete, until it takes its place.
constexpr std::string_view kSalvaged = ".salvaged";
constexpr std::string_view kAside = ".corrupt";

}  // namespace

StoreDatabase::StoreDatabase(std::string directory, const JsonService& json, const Clock& clock)
    : directory_(std::move(directory)),
      file_(storeFileIn(directory_)),
      path_(file_.path),
      json_(json),
      clock_(clock),
      age_(database_, clock) {}

StoreDatabase::Result StoreDatabase::write(const StoreBatch& batch) {
  if (database_.isOpen() && database_.hasMoved()) close();
  const Result opened = open();
  if (opened != Result::kDone) return opened;
  if (!age_.follow(bounds_.seconds)) return fail();
  if (batch.empty()) return opened;
  holdings_.begin();
  if (!begin_.run() || !insert(batch) || !commit_.run()) return fail();
  holdings_.commit();
  rtc_->committed();
  lives_->committed();
  return Result::kDone;
}

bool StoreDatabase::insert(const StoreBatch& batch) {
  if (!holdings_.add(batch) || !lives_->write(batch) || !rtc_->insertSessions(batch)) return false;
  for (const std::uint32_t user : lives_->newRows()) holdings_.addRow(user, kStoreSessionBytes);
  for (const RtcTable::NewSession& session : rtc_->newSessions()) {
    holdings_.addRow(session.user, session.bytes);
  }
  return numbering_->number(batch) && analytics_->insert(batch, *numbering_) && metrics_->insert(batch) &&
         power_->insert(batch) && rtc_->insertMessages(batch, numbering_->rtcMessages()) &&
         ledger_->insert(batch) && marks_->write(batch.marks());
}

void StoreDatabase::setBounds(const StoreBounds& bounds) {
  bounds_ = bounds;
  if (database_.isOpen()) applyBounds();
}

StoreDatabase::Result StoreDatabase::trimAge(bool& moreToDo) {
  if (!database_.isOpen()) return Result::kDone;
  std::optional<StoreRowIds> old = age_.olderThan(bounds_.seconds);
  const auto newestSending = database_.number("SELECT coalesce(max(id), 0) FROM sending_row");
  if (!old || !newestSending) return fail();
  std::int64_t& oldSendings = (*old)[storeTableIndex("sending_row")];
  oldSendings = std::max(oldSendings, *newestSending - kStoreSendings);
  return resultOf(trimmer_->trimAge(*old), moreToDo);
}

StoreDatabase::Result StoreDatabase::trimSize(bool& moreToDo) {
  if (!database_.isOpen()) return Result::kDone;
  if (!holdings_.read()) return fail();
  return resultOf(trimmer_->trimSize(bounds_), moreToDo);
}

bool StoreDatabase::beginAnew() {
  const std::string damage = problem_;
  close();
  holdings_.forget();
  const std::optional<FileIdentity> damaged = identityOf(path_);
  const bool hasOwnLives = damaged && (damaged == opened_ || damaged == saved_);
  if (!saveRows(damage)) return false;
  opened_.reset();
  saved_ = hasOwnLives ? identityOf(path_ + std::string(kSalvaged)) : std::nullopt;
  return takeSalvaged();
}

bool StoreDatabase::saveRows(const std::string& damage) {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (nextSalvage_ && now < *nextSalvage_) {
    problem_ = salvageProblem_;
    return false;
  }
  removeSalvaging();
  const StoreSalvage salvage(path_, path_ + std::string(kSalvaging));
  salvagedRows_ = salvage.rows();
  nextSalvage_.reset();
  if (salvage.problem().empty()) return endSalvage();
  removeSalvaging();
  nextSalvage_ = now + kSalvageInterval;
  salvageProblem_ = "it is damaged (" + damage + "), and its rows cannot be saved: " + salvage.problem();
  problem_ = salvageProblem_;
  return false;
}

void StoreDatabase::removeSalvaging() {
  for (const char* suffix : {"-journal", "-wal", "-shm", ""}) {
    std::error_code error;
    std::filesystem::remove(path_ + std::string(kSalvaging) + suffix, error);
  }
}

bool StoreDatabase::endSalvage() {
  std::error_code error;
  for (const char* suffix : {"-wal", "-shm", ""}) {
    std::filesystem::remove(path_ + std::string(kAside) + suffix, error);
  }
  std::filesystem::rename(path_ + std::string(kSalvaging), path_ + std::string(kSalvaged), error);
  if (error) problem_ = "what was saved of it cannot be renamed: " + error.message();
  return !error;
}

// From here on the process may end between any two steps, and the next start goes on with them.
bool StoreDatabase::takeSalvaged() {
  std::error_code error;
  if (!std::filesystem::exists(path_ + std::string(kSalvaged), error)) return true;
  // The saved file must not find the damaged one's log, or the log's pages would overwrite its own.
  for (const char* suffix : {"-wal", "-shm", ""}) {
    std::filesystem::rename(path_ + suffix, path_ + std::string(kAside) + suffix, error);
    if (error && error != std::errc::no_such_file_or_directory) {
      problem_ = "it is damaged and cannot be moved aside: " + error.message();
      return false;
    }
  }
  std::filesystem::rename(path_ + std::string(kSalvaged), path_, error);
  if (error) problem_ = "what was saved of it cannot be put in place: " + error.message();
  return !error;
}

StoreDatabase::Result StoreDatabase::open() {
  if (database_.isOpen()) return Result::kDone;
  std::error_code error;
  std::filesystem::create_directories(directory_, error);
  if (error) return failWith(error.message());
  removeSalvaging();
  if (!takeSalvaged()) return Result::kFailed;
  if (!database_.open(path_, SqliteDatabase::Mode::kReadWrite, kPatience)) return fail();
  const auto version = database_.number("PRAGMA user_version");
  if (!version) return fail();
  if (*version > kStoreSchemaVersion) {
    return failWith("it was made by a newer version (schema " + std::to_string(*version) + ")");
  }
  if (*version == 0 && !prepareFile()) return fail();
  if (*version > 0 && *version < kStoreSchemaVersion && !migrate(*version)) return fail();
  if (!ensureSendings()) return fail();
  // With this a commit costs no sync; each checkpoint makes one. A power cut loses the newest rows.
  if (!database_.run("PRAGMA journal_mode = WAL; PRAGMA synchronous = NORMAL;"
                     " PRAGMA temp_store = MEMORY")) {
    return fail();
  }
  applyBounds();
  const std::optional<FileIdentity> identity = identityOf(path_);
  const bool isKnown = identity && identity == opened_;
  const bool isSaved = identity && identity == saved_;
  if (!isKnown) {  // before the tables learn the file's number
    ++fileNumber_;
    if (!isSaved) firstSavedNumber_ = fileNumber_;
    holdings_.forget();
  }
  begin_ = database_.prepare("BEGIN IMMEDIATE");
  commit_ = database_.prepare("COMMIT");
  const std::optional<StoreRowIds> floors = readStoreFloors(database_);
  if (!floors) return fail();
  numbering_.emplace(database_, *floors);
  analytics_.emplace(database_);
  metrics_.emplace(database_, (*floors)[storeTableIndex("metric")]);
  power_.emplace(database_, (*floors)[storeTableIndex("power_event")]);
  rtc_.emplace(database_, json_, fileNumber_, (*floors)[storeTableIndex("rtc_session")]);
  lives_.emplace(database_, LifeTable::FileNumbers{fileNumber_, firstSavedNumber_},
                 (*floors)[storeTableIndex("session_row")]);
  ledger_.emplace(database_, (*floors)[storeTableIndex("sending_row")]);
  marks_.emplace(database_);
  trimmer_.emplace(database_, holdings_, clock_);
  if (!ensureStoreViews(database_)) return fail();
  if (!isKnown && !isSaved && !LifeTable::endInterrupted(database_)) return fail();
  if (!age_.open(isKnown)) return fail();
  opened_ = identity;
  saved_.reset();
  return Result::kDone;
}

std::optional<StoreDatabase::FileIdentity> StoreDatabase::identityOf(const std::string& path) {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) return std::nullopt;
  return FileIdentity{status.st_dev, status.st_ino};
}

bool StoreDatabase::prepareFile() {
  opened_.reset();
  saved_.reset();  // it may have the identity of a file that was removed
  return database_.run(storeFileSettings() + "PRAGMA journal_mode = WAL") && database_.run(storeSchema());
}

bool StoreDatabase::migrate(std::int64_t version) {
  const auto users =
      database_.number("SELECT count(*) FROM pragma_table_info('analytics_row') WHERE name = 'user_id'");
  const auto ages = database_.number("SELECT count(*) FROM sqlite_master WHERE name = 'age_clock'");
  if (!users || !ages) return false;
  return database_.run(storeMigration({version, *users > 0, *ages > 0}));
}

bool StoreDatabase::ensureSendings() {
  const auto tables = database_.number("SELECT count(*) FROM sqlite_master WHERE name = 'sending_row'");
  return tables && (*tables > 0 || database_.run(storeSendingsMigration()));
}

void StoreDatabase::applyBounds() {
  const std::int64_t pageBytes = database_.number("PRAGMA page_size").value_or(4096);
  const std::int64_t bytes = bounds_.walBytes();
  // A checkpoint at half of the bound leaves room for the batches that are written meanwhile. A failure only
  // leaves the log longer than it should be; when the file cannot be used, the next write fails, too.
  (void)database_.run("PRAGMA wal_autocheckpoint = " + std::to_string(bytes / 2 / pageBytes) +
                      "; PRAGMA journal_size_limit = " + std::to_string(bytes));
}

StoreDatabase::Result StoreDatabase::resultOf(StoreTrimmer::Outcome outcome, bool& moreToDo) {
  if (outcome == StoreTrimmer::Outcome::kFailed) return fail();
  moreToDo = moreToDo || outcome == StoreTrimmer::Outcome::kMoreToDo;
  return Result::kDone;
}

StoreDatabase::Result StoreDatabase::fail() {
  const Result result = database_.isCorrupt() ? Result::kCorrupt : Result::kFailed;
  closeWith(database_.problem());
  if (result == Result::kCorrupt) holdings_.forget();
  return result;
}

StoreDatabase::Result StoreDatabase::failWith(std::string problem) {
  closeWith(std::move(problem));
  return Result::kFailed;
}

void StoreDatabase::closeWith(std::string problem) {
  problem_ = std::move(problem);
  close();
}

void StoreDatabase::close() {
  // Statements are destroyed before their database. An open transaction is undone.
  begin_ = {};
  commit_ = {};
  numbering_.reset();
  analytics_.reset();
  metrics_.reset();
  power_.reset();
  rtc_.reset();
  lives_.reset();
  ledger_.reset();
  trimmer_.reset();
  marks_.reset();
  database_.close();
  holdings_.undo();
}

}  // namespace tonewerk

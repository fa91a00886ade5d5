// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/ReportStore.h"

#include <algorithm>
#include <cassert>
#include <cerrno>
#include <cmath>
#include <fcntl.h>
#include <pthread.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/store/StoreSchema.h"
#include "values/GrowingDelay.h"

namespace tonewerk {
namespace {

constexpr double kMegabyte = 1 << 20;
constexpr double kDaySeconds = 86'400.0;
// Larger bounds are cut to this (a petabyte, or 2.7 million years), which every type can hold that they are
// turned into.
constexpr double kUnbounded = 1e9;
// Without the marks reports come twice, and nobody may have a descriptor left for a moment.
constexpr int kMarkTries = 10;
constexpr std::chrono::milliseconds kMarkPause{20};

bool isNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr;
}

}  // namespace

ReportStore::ReportStore(const std::string& directory, const JsonService& json,
                         const PreferenceStore& preferences, const Clock& clock, Accounts& accounts,
                         const LogCategory& log, const Limits& limits, std::function<void()> beforeWriting)
    : preferences_(preferences),
      clock_(clock),
      accounts_(accounts),
      log_(log),
      beforeWriting_(std::move(beforeWriting)),
      queue_(limits),
      database_(directory, json, clock),
      thread_([this] { run(); }) {
  accounts.totals().setTotal(Resource::kSinkBytes, limits.bytes);
}

ReportStore::~ReportStore() {
  queue_.stop();
  thread_.join();
  const std::uint64_t lost = queue_.lost();
  if (lost > 0) errorLog(log_, "rows lost that could not be written to %s: %llu", database_.path(), lost);
}

void ReportStore::recordEvent(double recordedAt, EventNames names, ValueMap payload, EventSubject subject) {
  add(AnalyticsRow{recordedAt, std::move(names), std::move(payload), std::move(subject)});
}

void ReportStore::record(const MetricRow& row) { add(row); }

void ReportStore::record(const PowerRow& row) { add(row); }

// Played sessions have no real-time communication, so its rows must not count.
void ReportStore::record(const RtcSessionRow& row) { add(row, {}); }

void ReportStore::record(const RtcMessageRow& row) { add(row, {}); }

void ReportStore::record(const LifeRow& row) { addToQueue(row, {}); }

void ReportStore::record(const SendingRow& row) { queue_.addIfRoom(row); }

template <typename Row>
void ReportStore::add(const Row& row, JournalPosition::Row position) {
  if (isRecovering_ && isHeld(position)) return;
  addToQueue(row, position);
}

template <typename Row>
void ReportStore::addToQueue(const Row& row, JournalPosition::Row position) {
  const bool hangs = queue_.add(row, position);
  if (hangs) errorLog(log_, "writing to %s hangs; what does not fit is dropped", database_.path());
}

std::optional<StoreMarks> ReportStore::marks() {
  triedToOpen_.wait();
  std::string problem;
  std::optional<StoreMarks> marks = readStoreMarks(database_.path(), problem);
  for (int tries = 1; !marks && tries < kMarkTries; ++tries) {
    std::this_thread::sleep_for(kMarkPause);
    marks = readStoreMarks(database_.path(), problem);
  }
  if (!marks) errorLog(log_, "cannot read what %s holds of the journal: %s", database_.path(), problem);
  return marks;
}

void ReportStore::beginPlaying(StoreMarks marks) {
  heldMarks_ = std::move(marks);
  isPlaying_ = true;
  isRecovering_ = true;
}

void ReportStore::endRecovery() {
  isPlaying_ = false;
  isRecovering_ = false;
}

bool ReportStore::isHeld(JournalPosition::Row position) const {
  if (position.sequence == 0) return isPlaying_;
  const Account* account = WorkingFor::accountIfAny();
  const auto held = heldMarks_.find(account == nullptr ? kNoUser : account->user());
  return held != heldMarks_.end() && position <= held->second;
}

void ReportStore::readBoundsAgain() {
  areBoundsStale_ = true;
  queue_.wakeWriter();
}

int ReportStore::openedForSync() {
  const std::string& path = database_.path();
  struct stat named {};
  struct stat held {};
  if (syncFile_ && ::stat(path.c_str(), &named) == 0 && ::fstat(syncFile_.get(), &held) == 0 &&
      named.st_dev == held.st_dev && named.st_ino == held.st_ino) {
    return syncFile_.get();
  }
  syncFile_.reset(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
  return syncFile_.get();
}

bool ReportStore::sync() {
  const auto isDone = [this](int file, const std::string& path) {
    const bool isSynced = file >= 0 ? ::fdatasync(file) == 0 : errno == ENOENT;
    if (!isSynced) errorLog(log_, "cannot bring %s to the disk: %@", path, lastSystemError().message());
    return isSynced;
  };
  // SQLite has no locks on the log itself.
  const std::string logPath = database_.path() + "-wal";
  const FileDescriptor logFile(::open(logPath.c_str(), O_RDONLY | O_CLOEXEC));
  if (!isDone(logFile.get(), logPath)) return false;
  const std::lock_guard lock(syncMutex_);
  return isDone(openedForSync(), database_.path());
}

bool ReportStore::flush(std::chrono::milliseconds timeout) {
  assert(std::this_thread::get_id() != thread_.get_id());  // it would wait for itself
  return queue_.flush(timeout);
}

void ReportStore::run() {
  pthread_setname_np(pthread_self(), "tw-store");
  const Heartbeat::OnThisThread heartbeat(heartbeat_);
  heartbeat_->beat();
  if (const std::optional<std::int64_t> newer = database_.newerSchema()) {
    errorLog(log_,
             "%s is used, because a newer version made the %s beside it (schema %lli), which is left alone",
             database_.path(), kStoreFileName, *newer);
  }
  // The file is made, and its problems are logged, before the first row is recorded.
  queue_.beginAttempt();
  if (write()) {
    queue_.committed();
  } else {
    queue_.failed();
  }
  triedToOpen_.count_down();
  while (takeBatch()) {
    if (!writeUntilDone()) return;
  }
}

bool ReportStore::takeBatch() {
  const Heartbeat::Rest rest;
  return queue_.take(batch_, !moreToTrim_);
}

bool ReportStore::pause(std::chrono::nanoseconds time) {
  const Heartbeat::Rest rest;
  return queue_.pause(time);
}

// Writes the batch, again after each failure. False when the store stops and the rows are not written.
bool ReportStore::writeUntilDone() {
  GrowingDelay backOff(kFirstBackOff, kLongestBackOff);
  for (;;) {
    queue_.beginAttempt();
    if (write()) break;
    queue_.failed();
    if (!pause(backOff.next())) {
      if (!write()) return false;
      break;
    }
  }
  // The log line comes before those who wait for the rows continue.
  logSuccess(queue_.takeDropped());
  queue_.committed();
  return true;
}

bool ReportStore::write() {
  readBounds();
  if (writeOrBeginAnew() != StoreDatabase::Result::kDone) {
    logFailure();
    return false;
  }
  trim();
  chargeStored();
  return true;
}

StoreDatabase::Result ReportStore::writeOrBeginAnew() {
  if (beforeWriting_) beforeWriting_();
  const StoreDatabase::Result result = database_.write(batch_);
  logJump();
  if (result != StoreDatabase::Result::kCorrupt) return result;
  return beginAnew() ? database_.write(batch_) : StoreDatabase::Result::kFailed;
}

bool ReportStore::beginAnew() {
  const std::string damage = database_.problem();
  if (!database_.beginAnew()) return false;  // the caller logs the problem
  errorLog(log_, "%s is damaged (%s); it is moved aside and a new one begun; rows saved of it: %lli",
           database_.path(), damage, database_.salvagedRows());
  return true;
}

void ReportStore::trim() {
  const bool ageDue = std::exchange(ageDue_, false);
  const bool wasTrimming = std::exchange(moreToTrim_, false);
  StoreDatabase::Result result = database_.trimSize(moreToTrim_);
  if (result == StoreDatabase::Result::kDone && (ageDue || wasTrimming)) {
    result = database_.trimAge(moreToTrim_);
  }
  if (result == StoreDatabase::Result::kDone) {
    loggedTrimProblem_.clear();
    return;
  }
  moreToTrim_ = false;
  if (result == StoreDatabase::Result::kCorrupt && beginAnew()) return;
  if (loggedTrimProblem_ == database_.problem()) return;
  loggedTrimProblem_ = database_.problem();
  errorLog(log_, "cannot keep %s within its bounds: %s", database_.path(), loggedTrimProblem_);
}

// A user who connects later is charged with the next batch.
void ReportStore::chargeStored() {
  for (const std::shared_ptr<Account>& account : accounts_.all()) {
    const std::uint32_t user = account->user();
    Charge& charge = stored_.try_emplace(user, account, Resource::kStoredBytes, 0).first->second;
    charge.setTo(static_cast<std::uint64_t>(database_.bytesOf(user)));
  }
}

void ReportStore::readBounds() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (!areBoundsStale_.exchange(false) && now - boundsReadAt_ < kBoundsInterval) return;
  boundsReadAt_ = now;
  ageDue_ = true;
  StoreBounds bounds;
  std::string wrong;
  bounds.bytes = static_cast<std::int64_t>(bound(kMaxMegabytesKey, 256, wrong) * kMegabyte);
  bounds.seconds = bound(kMaxDaysKey, 30, wrong) * kDaySeconds;
  if (!wrong.empty() && wrong != loggedWrongBounds_) {
    errorLog(log_, "preferences of %s that are no number from 1 are left out:%s", kPreferenceDomain, wrong);
  }
  loggedWrongBounds_ = wrong;
  accounts_.totals().setTotal(Resource::kStoredBytes, static_cast<std::uint64_t>(bounds.bytes));
  if (bounds == bounds_) return;
  bounds_ = bounds;
  database_.setBounds(bounds_);
}

// The preference if it is a number from 1, else `otherwise`. A value that is no such number is added to
// `wrong`.
double ReportStore::bound(std::string_view key, double otherwise, std::string& wrong) const {
  const std::optional<Value> value = preferences_.read(kPreferenceDomain, key);
  if (!value) return otherwise;
  if (isNumber(*value) && value->number() >= 1.0) return std::min(value->number(), kUnbounded);
  wrong += " " + std::string(key) + " = " + value->text();
  return otherwise;
}

void ReportStore::logJump() {
  const double jump = database_.takeJump();
  if (jump == 0.0) return;
  defaultLog(log_, "the wall clock jumped %s by %lli s; the age of what is stored does not follow it",
             jump > 0.0 ? "forward" : "back", std::llround(std::fabs(jump)));
}

void ReportStore::logFailure() {
  if (loggedProblem_ == database_.problem()) return;
  loggedProblem_ = database_.problem();
  errorLog(log_, "cannot write %s: %s; rows are kept while there is room", database_.path(), loggedProblem_);
}

void ReportStore::logSuccess(std::uint64_t dropped) {
  const bool resumed = !std::exchange(loggedProblem_, {}).empty();
  if (resumed || dropped > 0) {
    errorLog(log_, "writing to %s goes on; rows dropped meanwhile: %llu", database_.path(), dropped);
  }
}

}  // namespace tonewerk

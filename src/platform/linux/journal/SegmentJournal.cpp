// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/SegmentJournal.h"

#include <algorithm>
#include <optional>
#include <random>
#include <thread>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/journal/SegmentFormat.h"
#include "platform/linux/journal/SegmentNames.h"
#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

// A newest segment of dropped records is replaced by an empty one when it has more than this part of the
// bytes that it may have.
constexpr std::size_t kReplacedPart = 64;
// The part of the waiting records that is given up at a time, so that it does not cost each later record.
constexpr std::size_t kGivenUpPart = 8;

}  // namespace

SegmentJournal::SegmentJournal(std::unique_ptr<JournalDirectory> directory,
                               const PreferenceStore& preferences, const LogCategory& log,
                               const Limits& limits)
    : directory_(std::move(directory)),
      log_(log),
      limits_(limits),
      marker_(std::random_device{}()),
      pending_(marker_),
      old_(*directory_, preferences, log) {
  if (const std::error_code error = tried([this] { return open(); })) logFailure(error);
}

SegmentJournal::~SegmentJournal() {
  givenUp_ += pending_.giveUp(pending_.bytes().size());
  if (givenUp_ > 0) {
    errorLog(log_, "requests that are lost because %s was not written: %llu", directory_->path(), givenUp_);
  }
}

// --- The directory ---

std::error_code SegmentJournal::tried(FunctionRef<std::error_code()> act) const {
  std::error_code error = act();
  for (int tries = 1; error && isStarting_ && tries < limits_.tries; ++tries) {
    std::this_thread::sleep_for(limits_.pause);
    error = act();
  }
  return error;
}

std::error_code SegmentJournal::read(const std::string& name, std::size_t maxBytes,
                                     std::string& bytes) const {
  return tried([&] { return directory_->read(name, maxBytes, bytes); });
}

std::error_code SegmentJournal::open() {
  std::vector<JournalDirectory::Entry> entries;
  {
    const MutexLock lock(syncMutex_);
    if (const std::error_code error = directory_->open()) return error;
  }
  if (const std::error_code error = directory_->list(entries)) return error;
  isOpen_ = true;
  segments_.clear();
  old_.clear();
  file_.reset();
  std::sort(entries.begin(), entries.end(), [](const auto& a, const auto& b) { return a.name < b.name; });
  for (const JournalDirectory::Entry& entry : entries) {
    if (segmentNumberOf(entry.name)) addSegment(entry);
    if (entry.name.ends_with(kOldSegmentEnding)) old_.add(entry);
  }
  findLast();
  removeEmptySegments();
  trimOld();
  countBytes();
  return {};
}

void SegmentJournal::addSegment(const JournalDirectory::Entry& entry) {
  std::string bytes;
  const std::error_code error = read(entry.name, kSegmentHeadBytes, bytes);
  const std::optional<SegmentHead> head = readSegmentHead(bytes);
  if (error) return leaveAlone(entry.name, entry.bytes, error.message());
  if (head && head->version > kSegmentVersion) {
    return leaveAlone(entry.name, entry.bytes, "a newer version of the program has written it");
  }
  Segment segment;
  segment.first = *segmentNumberOf(entry.name);
  segment.name = entry.name;
  segment.fileBytes = entry.bytes;
  segment.keptBytes = entry.bytes - std::min<std::uint64_t>(entry.bytes, kSegmentHeadBytes);
  segment.newestAt = entry.changedAt;
  segments_.push_back(std::move(segment));
}

// Its numbers are not used again: a file has fewer records than bytes.
void SegmentJournal::leaveAlone(const std::string& name, std::uint64_t bytes, std::string_view why) {
  errorLog(log_, "%s/%s is left alone: %s", directory_->path(), name, why);
  last_ = std::max(last_, *segmentNumberOf(name) + bytes);
}

// Reads the newest segment that can be read.
void SegmentJournal::findLast() {
  while (!segments_.empty()) {
    Segment& newest = segments_.back();
    std::string bytes;
    if (const std::error_code error = read(newest.name, kMaxSegmentBytes, bytes)) {
      leaveAlone(newest.name, newest.fileBytes, error.message());
      segments_.pop_back();
      continue;
    }
    SegmentScan scan(bytes, newest.first - 1);
    while (const std::optional<Record> record = scan.next()) newest.newestAt = record->origin.at;
    last_ = std::max(last_, scan.last());
    newest.isTorn = newest.fileBytes > scan.end();
    newest.fileBytes = scan.end();
    newest.keptBytes = scan.end() - std::min(scan.end(), kSegmentHeadBytes);
    newestAt_ = newest.newestAt;
    return;
  }
}

// They were begun while nothing could be written. The newest one holds the place of the next number.
void SegmentJournal::removeEmptySegments() {
  for (std::size_t at = 0; at + 1 < segments_.size();) {
    const bool isEmpty = segments_[at].fileBytes <= kSegmentHeadBytes;
    if (isEmpty && !directory_->remove(segments_[at].name)) {
      segments_.erase(segments_.begin() + static_cast<std::ptrdiff_t>(at));
    } else {
      ++at;
    }
  }
}

// Opens the directory after a failure. Meanwhile records got numbers that segments in it may have, too. These
// records are given up. Segments that this process has not read are left to the next one.
std::error_code SegmentJournal::openLate() {
  const std::uint64_t own = std::exchange(last_, 0);
  const std::error_code error = open();
  segments_.clear();
  const std::uint64_t found = std::exchange(last_, std::max(own, last_));
  if (!error && !pending_.empty() && found >= pending_.first()) giveUp(pending_.bytes().size());
  return error;
}

// --- Adding ---

std::uint64_t SegmentJournal::append(Kind kind, const Origin& origin, std::string_view bytes) {
  isStarting_ = false;
  ++last_;
  newestAt_ = origin.at;
  if (bytes.size() > kMaxRecordBytes) {
    if (!std::exchange(isTooLongLogged_, true)) {
      errorLog(log_, "a request of %zu bytes is too long to be kept in %s", bytes.size(), directory_->path());
    }
    ++givenUp_;
    return last_;
  }
  const std::size_t size = kRecordHeadBytes + bytes.size();
  if (pending_.bytes().size() + size > limits_.pendingBytes) makeRoom(size);
  pending_.append({last_, kind, origin, bytes});
  bytes_.store(bytes_.load(std::memory_order_relaxed) + size, std::memory_order_relaxed);
  return last_;
}

std::uint64_t SegmentJournal::append(const Origin& origin, std::string_view method,
                                     const Arguments& arguments) {
  frame_.clear();
  RpcWriter(frame_).notification(method, arguments);
  return append(Kind::kRequest, origin, frame_);
}

void SegmentJournal::makeRoom(std::size_t bytes) {
  if (!write()) giveUp(std::max(bytes, limits_.pendingBytes / kGivenUpPart));
}

void SegmentJournal::giveUp(std::size_t bytes) {
  if (givenUp_ == 0)
    errorLog(log_, "%s cannot be written; the oldest records are given up", directory_->path());
  givenUp_ += pending_.giveUp(bytes);
  countBytes();
}

bool SegmentJournal::write() {
  while (!pending_.empty()) {
    if (const std::error_code error = writeSome()) {
      logFailure(error);
      return false;
    }
  }
  logSuccess();
  return true;
}

// Writes what fits into one segment.
std::error_code SegmentJournal::writeSome() {
  if (!hasRoom()) {
    if (const std::error_code error = beginSegment()) return error;
    if (pending_.empty()) return {};
  }
  Segment& segment = segments_.back();
  std::size_t written = 0;
  const std::error_code error =
      file_->write(segment.fileBytes, pending_.bytes().substr(0, fitting()), written);
  const std::size_t whole = pending_.wholeWithin(written);
  if (whole > 0) noteWritten(segment, whole);
  if (error && written > whole) cutOff(segment);
  return error;
}

// Whether the next record fits into the newest segment.
bool SegmentJournal::hasRoom() const {
  if (file_ == nullptr) return false;
  const std::uint64_t used = segments_.back().fileBytes;
  return used <= kSegmentHeadBytes || used + sizeOfRecord(pending_.bytes()) <= limits_.segmentBytes;
}

// The bytes of the records that fit into the newest segment, of one at least.
std::size_t SegmentJournal::fitting() const {
  const std::uint64_t used = segments_.back().fileBytes;
  const std::size_t room = limits_.segmentBytes - std::min<std::uint64_t>(used, limits_.segmentBytes);
  return std::max(pending_.wholeWithin(room), sizeOfRecord(pending_.bytes()));
}

void SegmentJournal::noteWritten(Segment& segment, std::size_t bytes) {
  segment.fileBytes += bytes;
  segment.keptBytes += bytes;
  segment.newestAt = newestAt_;
  pending_.remove(bytes);
  const MutexLock lock(mutex_);
  if (std::find(unsynced_.begin(), unsynced_.end(), file_) == unsynced_.end()) unsynced_.push_back(file_);
}

// Removes a part of a record from the end. If that fails, the next record begins another segment.
void SegmentJournal::cutOff(Segment& segment) {
  if (!file_->truncate(segment.fileBytes)) return;
  segment.isTorn = true;
  file_.reset();
}

// The new segment has the number of the next record that is written.
std::error_code SegmentJournal::beginSegment() {
  if (!isOpen_) {
    if (const std::error_code error = openLate()) return error;
  }
  const std::uint64_t first = nextWritten();
  std::shared_ptr<JournalFile> file;
  file_.reset();
  const std::string name = segmentNameOf(first);
  if (const std::error_code error = directory_->create(name, file)) {
    if (error == std::errc::no_such_file_or_directory) isOpen_ = false;  // somebody has removed the directory
    return error;
  }
  leaveNewest(first);
  Segment segment;
  segment.first = first;
  segment.name = name;
  segment.newestAt = newestAt_;
  segment.file = file;
  segments_.push_back(segment);
  std::size_t written = 0;
  if (const std::error_code error = file->write(0, segmentHead(marker_), written)) return error;
  segments_.back().fileBytes = kSegmentHeadBytes;
  file_ = std::move(file);
  {
    const MutexLock lock(mutex_);
    unsynced_.push_back(file_);
    isDirectoryUnsynced_ = true;
  }
  trimOld();
  return {};
}

// Finishes the newest segment before the one with `first` takes its place.
void SegmentJournal::leaveNewest(std::uint64_t first) {
  if (segments_.empty()) return;
  Segment& newest = segments_.back();
  if (newest.first == first) {
    segments_.pop_back();  // it is the same file, which had no record
  } else if (newest.fileBytes <= kSegmentHeadBytes) {
    if (!directory_->remove(newest.name)) segments_.pop_back();
  } else if (newest.isTorn) {
    // If this fails, a reader finds what is there to be damage.
    newest.isTorn = static_cast<bool>(directory_->truncate(newest.name, newest.fileBytes));
  }
}

std::uint64_t SegmentJournal::nextWritten() const { return pending_.empty() ? last_ + 1 : pending_.first(); }

void SegmentJournal::continueAfter(std::uint64_t sequence) { last_ = std::max(last_, sequence); }

// --- Syncing ---

bool SegmentJournal::sync() {
  const MutexLock one(syncMutex_);
  std::vector<std::shared_ptr<JournalFile>> files;
  bool isDirectoryUnsynced = false;
  {
    const MutexLock lock(mutex_);
    files.swap(unsynced_);
    isDirectoryUnsynced = std::exchange(isDirectoryUnsynced_, false);
  }
  std::error_code problem;
  std::vector<std::shared_ptr<JournalFile>> failed;
  for (std::shared_ptr<JournalFile>& file : files) {
    if (const std::error_code error = file->sync()) {
      problem = error;
      failed.push_back(std::move(file));
    }
  }
  if (isDirectoryUnsynced) {
    if (const std::error_code error = directory_->sync()) {
      problem = error;
    } else {
      isDirectoryUnsynced = false;
    }
  }
  if (problem) {
    const MutexLock lock(mutex_);
    unsynced_.insert(unsynced_.end(), failed.begin(), failed.end());
    isDirectoryUnsynced_ = isDirectoryUnsynced_ || isDirectoryUnsynced;
  }
  logSync(problem);
  return !problem;
}

void SegmentJournal::logSync(const std::error_code& problem) {
  const std::string text = problem ? problem.message() : std::string();
  const std::string before = std::exchange(loggedSyncProblem_, text);
  if (before == text) return;
  if (problem) {
    errorLog(log_, "cannot bring %s to the disk: %s", directory_->path(), text);
  } else {
    errorLog(log_, "%s is brought to the disk again", directory_->path());
  }
}

// --- Reading ---

Journal::Reading SegmentJournal::read(FunctionRef<bool(const Record&)> visit) {
  Reading reading;
  std::string bytes;
  bool goesOn = true;
  for (std::size_t at = 0; goesOn && at < segments_.size(); ++at) {
    Segment& segment = segments_[at];
    if (const std::error_code error = read(segment.name, kMaxSegmentBytes, bytes)) {
      errorLog(log_, "cannot read %s/%s: %s", directory_->path(), segment.name, error.message());
      ++reading.damagedPlaces;
      reading.damagedBytes += segment.fileBytes;
      continue;
    }
    SegmentScan scan(bytes, segment.first - 1);
    while (goesOn) {
      const std::optional<Record> record = scan.next();
      if (!record) break;
      ++reading.records;
      segment.newestAt = record->origin.at;
      goesOn = visit(*record);
    }
    reading.damagedPlaces += scan.damagedPlaces();
    reading.damagedBytes += scan.damagedBytes();
    const std::uint64_t rest = std::max<std::uint64_t>(bytes.size(), segment.fileBytes) - scan.end();
    if (!goesOn || rest == 0) continue;
    if (at + 1 == segments_.size()) {
      reading.tornBytes += rest;
    } else {
      ++reading.damagedPlaces;
      reading.damagedBytes += rest;
    }
  }
  return reading;
}

// --- Dropping ---

void SegmentJournal::drop(std::uint64_t before) {
  while (segments_.size() > 1 && segments_[1].first <= before && retire(segments_.front())) {
    segments_.pop_front();
    trimOld();
  }
  if (segments_.size() == 1 && nextWritten() <= before) {
    segments_.front().keptBytes = 0;
    if (segments_.front().fileBytes > limits_.segmentBytes / kReplacedPart) replaceNewest();
  }
  countBytes();
}

void SegmentJournal::clear() {
  pending_.giveUp(pending_.bytes().size());
  drop(last_ + 1);
  if (segments_.size() == 1 && segments_.front().fileBytes > kSegmentHeadBytes) replaceNewest();
  countBytes();
}

// In whole segments. What waits to be written belongs to the newest.
std::uint64_t SegmentJournal::firstWithin(std::uint64_t bytes) const {
  std::uint64_t sum = pending_.bytes().size();
  std::uint64_t first = last_ + 1;
  for (auto segment = segments_.rbegin(); segment != segments_.rend(); ++segment) {
    sum += segment->keptBytes;
    if (sum > bytes) break;
    first = segment->first;
  }
  return first;
}

// The only segment has nothing but dropped records.
void SegmentJournal::replaceNewest() {
  if (const std::error_code error = beginSegment()) return logFailure(error);
  // The old one is already gone when it had no record or somebody has removed the directory.
  if (segments_.size() == 1 || !retire(segments_.front())) return;
  segments_.pop_front();
  trimOld();
}

bool SegmentJournal::retire(const Segment& segment) {
  const std::error_code error = old_.take(segment.name, segment.fileBytes, segment.newestAt);
  if (error && error != std::errc::no_such_file_or_directory) {
    if (std::exchange(loggedDropProblem_, error.message()) != error.message()) {
      errorLog(log_, "cannot remove %s/%s: %s", directory_->path(), segment.name, error.message());
    }
    return false;
  }
  loggedDropProblem_.clear();
  const std::shared_ptr<JournalFile> file = segment.file.lock();
  const MutexLock lock(mutex_);
  unsynced_.erase(std::remove(unsynced_.begin(), unsynced_.end(), file), unsynced_.end());
  return true;
}

void SegmentJournal::trimOld() {
  std::uint64_t bytes = 0;
  for (const Segment& segment : segments_) bytes += segment.fileBytes;
  old_.trim(bytes, newestAt_);
}

void SegmentJournal::countBytes() {
  std::uint64_t bytes = pending_.bytes().size();
  for (const Segment& segment : segments_) bytes += segment.keptBytes;
  bytes_.store(bytes, std::memory_order_relaxed);
}

// --- The log ---

void SegmentJournal::logFailure(const std::error_code& error) {
  if (loggedProblem_ == error.message()) return;
  loggedProblem_ = error.message();
  errorLog(log_, "cannot write %s: %s; requests are kept while there is room", directory_->path(),
           loggedProblem_);
}

void SegmentJournal::logSuccess() {
  if (loggedProblem_.empty()) return;
  loggedProblem_.clear();
  errorLog(log_, "writing to %s goes on; requests given up meanwhile: %llu", directory_->path(), givenUp_);
  givenUp_ = 0;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/DiagnosticsStore.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <utility>

#include "platform/Clock.h"
#include "platform/JsonService.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {
namespace {

constexpr double kMegabyte = 1 << 20;
constexpr double kDefaultMegabytes = 256;
constexpr double kDefaultItems = 500;
// Preferences are clamped to this, so that they fit into every type they are converted to.
constexpr double kUnbounded = 1e9;
constexpr int kCollectorNiceness = 5;
// How long an item may take after its evidence is collected, before the disk counts as hanging.
constexpr std::chrono::seconds kLongestWriting{10};
constexpr const char* kRequestFile = "request.json";

bool isNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr;
}

// "20261120T101800.123Z"
std::string timeName(double at) {
  const double whole = std::floor(at);
  const auto seconds = static_cast<std::time_t>(whole);
  std::tm utc{};
  gmtime_r(&seconds, &utc);
  std::array<char, 64> text{};
  const std::size_t size = std::strftime(text.data(), text.size(), "%Y%m%dT%H%M%S", &utc);
  std::snprintf(text.data() + size, text.size() - size, ".%03dZ", static_cast<int>((at - whole) * 1e3));
  return text.data();
}

ValueArray namesOf(const std::vector<DiagnosticFile>& files) {
  ValueArray names;
  for (const DiagnosticFile& file : files) names.append(file.name);
  return names;
}

}  // namespace

DiagnosticsStore::DiagnosticsStore(std::string stateDirectory,
                                   std::vector<std::shared_ptr<DiagnosticCollector>> collectors,
                                   const JsonService& json, const PreferenceStore& preferences,
                                   const Clock& clock, const LogCategory& log, const Limits& limits)
    : json_(json),
      preferences_(preferences),
      clock_(clock),
      log_(log),
      limits_(limits),
      directory_(std::move(stateDirectory)),
      longestItem_(limits.collectors.time * collectors.size() + kLongestWriting),
      runner_(std::move(collectors), limits.collectors),
      thread_([this] { run(); }) {}

DiagnosticsStore::~DiagnosticsStore() { finish(std::chrono::milliseconds(0)); }

std::error_code DiagnosticsStore::add(DiagnosticItem item, Completion completion) {
  if (!item.name.empty() && !DiagnosticsDirectory::isPlainName(item.name)) {
    return std::make_error_code(std::errc::invalid_argument);
  }
  const double now = clock_.now();
  const std::size_t bytes = item.request.bytes();
  std::uint64_t refusedBefore = 0;
  {
    const MutexLock lock(mutex_);
    if (isEnding_) return std::make_error_code(std::errc::operation_canceled);
    const bool fits = pending_.size() < limits_.pendingItems &&
                      (pending_.empty() || pendingBytes_ + bytes <= limits_.pendingBytes);
    if (!fits) {
      const bool isFirst = refused_++ == 0;
      ++lost_;
      if (isFirst) errorLog(log_, "too many diagnostics at once; requests are refused");
      return std::make_error_code(std::errc::no_buffer_space);
    }
    // Only when the queue is empty again. If it were logged whenever one place is free, there would be a line
    // for almost every request while too many arrive.
    if (pending_.empty()) refusedBefore = std::exchange(refused_, 0);
    pendingBytes_ += bytes;
    pending_.push_back({std::move(item), now, std::move(completion)});
  }
  changed_.notifyAll();
  if (refusedBefore > 0)
    errorLog(log_, "diagnostics are taken again; refused meanwhile: %llu", refusedBefore);
  return {};
}

SinkStatus DiagnosticsStore::status() const {
  const auto now = std::chrono::steady_clock::now();
  const MutexLock lock(mutex_);
  SinkStatus status{
      .name = "diagnostics", .waiting = pending_.size() + (isIdle_ ? 0 : 1), .dropped = lost_, .hangs = {}};
  const bool moves = isIdle_ || now - busySince_ < longestItem_;
  if (!moves) status.hangs = std::chrono::ceil<std::chrono::seconds>(now - busySince_);
  return status;
}

void DiagnosticsStore::finish(std::chrono::milliseconds timeout) {
  {
    MutexLock lock(mutex_);
    isEnding_ = true;
    changed_.notifyAll();
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!(isIdle_ && pending_.empty()) && changed_.waitUntil(lock, deadline)) {
    }
  }
  runner_.interrupt();
  if (thread_.joinable()) thread_.join();
}

void DiagnosticsStore::removeLeftovers() {
  {
    const MutexLock lock(mutex_);
    sweepIsDue_ = true;
  }
  changed_.notifyAll();
}

void DiagnosticsStore::run() {
  nameThisThread("tw-diagnostics");
  setNicenessOfThisThread(kCollectorNiceness);
  while (const std::optional<Pending> pending = take()) process(*pending);
}

// Waits for the next item. None when the store ends and no items are left.
std::optional<DiagnosticsStore::Pending> DiagnosticsStore::take() {
  MutexLock lock(mutex_);
  for (;;) {
    isIdle_ = true;
    changed_.notifyAll();
    while (!isEnding_ && !sweepIsDue_ && pending_.empty()) changed_.wait(lock);
    if (pending_.empty() && !sweepIsDue_) return std::nullopt;
    isIdle_ = false;
    busySince_ = std::chrono::steady_clock::now();
    if (std::exchange(sweepIsDue_, false)) {
      lock.unlock();
      sweep();
      lock.lock();
      continue;
    }
    Pending pending = std::move(pending_.front());
    pending_.pop_front();
    pendingBytes_ -= pending.item.request.bytes();
    return pending;
  }
}

void DiagnosticsStore::process(const Pending& pending) {
  const std::string name = nameOf(pending.item, pending.requestedAt);
  const std::string path = directory_.pathOf(pending.item.kind, name);
  const std::error_code error = writeItem(pending.item, name, pending.requestedAt);
  if (error) {
    errorLog(log_, "cannot write %s: %s", path, error.message());
    const MutexLock lock(mutex_);
    ++lost_;
  } else {
    infoLog(log_, "wrote %s", path);
  }
  if (pending.completion) pending.completion(error, name);
}

std::error_code DiagnosticsStore::writeItem(const DiagnosticItem& item, const std::string& name,
                                            double requestedAt) {
  if (directory_.contains(item.kind, name)) return std::make_error_code(std::errc::file_exists);
  DiagnosticEvidence evidence = runner_.run();
  std::vector<DiagnosticFile> files;
  files.push_back({kRequestFile, requestText(item, requestedAt, evidence)});
  if (item.describe) files.push_back(item.describe(Date{requestedAt}, evidence));
  for (DiagnosticFile& file : evidence.files) files.push_back(std::move(file));
  if (const std::error_code error = makeRoom(DiagnosticsDirectory::bytesOnDisk(files))) return error;
  return directory_.write(item.kind, name, files);
}

std::string DiagnosticsStore::requestText(const DiagnosticItem& item, double requestedAt,
                                          const DiagnosticEvidence& evidence) const {
  ValueMap request = item.request;
  request.set("requestedAt", Date{requestedAt});
  request.set("collected", namesOf(evidence.files));
  ValueMap problems;
  for (const auto& [file, problem] : evidence.problems) problems.set(SharedString(file), problem);
  if (!problems.empty()) request.set("problems", problems);
  std::string ignored;
  // If JSON cannot express a number of the payload, compact() writes it as null.
  return json_.pretty(request, ignored).value_or(json_.compact(request)) + "\n";
}

// An item without a name is named after its time. If that name is taken, a number is added.
std::string DiagnosticsStore::nameOf(const DiagnosticItem& item, double requestedAt) const {
  if (!item.name.empty()) return item.name;
  const std::string time = timeName(requestedAt);
  std::string name = time;
  for (int next = 2; directory_.contains(item.kind, name); ++next) name = time + "-" + std::to_string(next);
  return name;
}

// Removes the oldest items until there is room for a new one of `bytes` bytes.
std::error_code DiagnosticsStore::makeRoom(std::uint64_t bytes) {
  const Bounds bounds = readBounds();
  if (bytes > bounds.bytes) return std::make_error_code(std::errc::file_too_large);
  const std::vector<DiagnosticsDirectory::Entry> entries = directory_.listAll();
  std::uint64_t total = bytes;
  for (const DiagnosticsDirectory::Entry& entry : entries) total += entry.bytes;
  std::size_t count = entries.size() + 1;
  std::error_code failure;
  for (const DiagnosticsDirectory::Entry& entry : entries) {
    if (total <= bounds.bytes && count <= bounds.items) return {};
    const std::error_code error = directory_.remove(entry.kind, entry.name);
    // Users may remove items, too. If an item cannot be removed, the next one is tried.
    if (error && error != std::errc::no_such_file_or_directory) {
      failure = error;
      continue;
    }
    infoLog(log_, "removed %s to make room", directory_.pathOf(entry.kind, entry.name));
    total -= entry.bytes;
    --count;
  }
  return total <= bounds.bytes && count <= bounds.items ? std::error_code() : failure;
}

DiagnosticsStore::Bounds DiagnosticsStore::readBounds() {
  std::string wrong;
  const Bounds bounds{
      static_cast<std::uint64_t>(bound(kMaxMegabytesKey, kDefaultMegabytes, wrong) * kMegabyte),
      static_cast<std::size_t>(bound(kMaxItemsKey, kDefaultItems, wrong))};
  if (!wrong.empty() && wrong != loggedWrongBounds_) {
    errorLog(log_, "preferences of %s that are no number from 1 are left out:%s", kPreferenceDomain, wrong);
  }
  loggedWrongBounds_ = wrong;
  return bounds;
}

// The preference if it is a number of at least 1, otherwise `otherwise`. Appends the preference to `wrong` if
// it is anything else.
double DiagnosticsStore::bound(std::string_view key, double otherwise, std::string& wrong) const {
  const std::optional<Value> value = preferences_.read(kPreferenceDomain, key);
  if (!value) return otherwise;
  if (isNumber(*value) && value->number() >= 1.0) return std::min(value->number(), kUnbounded);
  wrong += " " + std::string(key) + " = " + value->text();
  return otherwise;
}

void DiagnosticsStore::sweep() {
  const std::size_t count = directory_.sweep();
  if (count > 0) errorLog(log_, "removed diagnostics that were not complete: %zu", count);
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>
#include <vector>

#include "platform/SinkStatus.h"
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/diagnostics/collectors/CollectorRunner.h"
#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class JsonService;
class LogCategory;
class PreferenceStore;

// Writes diagnostics to the disk: for each request a folder with request.json and the collectors' files.
//
//   add() -> bounded queue -> the store's thread: collect, make room, write, call the completion
//
// request.json holds the item's request and in addition
//   "requestedAt"   the date of add()
//   "collected"     the names of the other files
//   "problems"      by file name, why a file is missing or incomplete; absent if there are no problems
//
// The items of all kinds together are limited by the preferences "max_megabytes" (256) and "max_items" (500)
// of the domain "com.orvane.tonewerk.diagnostics", which are read for each item. Before a new item is
// written, the oldest ones are removed as necessary. An item that cannot be written, for example on a full
// disk, is logged and leaves no files behind.
class DiagnosticsStore {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.diagnostics";
  static constexpr std::string_view kMaxMegabytesKey = "max_megabytes";
  static constexpr std::string_view kMaxItemsKey = "max_items";

  struct Limits {
    // More captures than can become due at the same time.
    std::size_t pendingItems = 48;
    std::size_t pendingBytes = std::size_t{16} << 20;  // of requests; a single item always fits
    CollectorRunner::Limits collectors = {};
  };

  // Says whether the item is on the disk, and its name. Called once, on the store's thread.
  using Completion = std::function<void(const std::error_code& error, const std::string& name)>;

  // Items are written to subdirectories of `stateDirectory`, which are created when necessary. All references
  // must outlive the store.
  DiagnosticsStore(std::string stateDirectory, std::vector<std::shared_ptr<DiagnosticCollector>> collectors,
                   const JsonService& json, const PreferenceStore& preferences, const Clock& clock,
                   const LogCategory& log, const Limits& limits);
  DiagnosticsStore(const DiagnosticsStore&) = delete;
  DiagnosticsStore& operator=(const DiagnosticsStore&) = delete;
  // Calls finish(0).
  ~DiagnosticsStore();

  // Any thread; never waits. The completion may be empty. It is called only if add() does not fail with
  //   invalid_argument     the name is not a plain name
  //   no_buffer_space      too many items are pending, which is logged
  //   operation_canceled   finish() was called
  // If an item with this name exists, the completion gets std::errc::file_exists.
  [[nodiscard]] std::error_code add(DiagnosticItem item, Completion completion);

  // Any thread. Counts items. The store hangs when an item takes longer than its collectors may.
  SinkStatus status() const;

  // Lets the store's thread remove incomplete items that a crash left behind. Call it only when no other
  // daemon can be writing to the directory, because the items that one is writing look the same.
  void removeLeftovers();

  // Accepts no more items. Pending items are completed within `timeout`; the rest is then written without
  // evidence. No completion is called after it has returned.
  void finish(std::chrono::milliseconds timeout);

 private:
  struct Pending {
    DiagnosticItem item;
    double requestedAt = 0.0;
    Completion completion;
  };
  struct Bounds {
    std::uint64_t bytes = 0;
    std::size_t items = 0;
  };

  void run();
  [[nodiscard]] std::optional<Pending> take();
  void process(const Pending& pending);
  [[nodiscard]] std::error_code writeItem(const DiagnosticItem& item, const std::string& name,
                                          double requestedAt);
  std::string requestText(const DiagnosticItem& item, double requestedAt,
                          const DiagnosticEvidence& evidence) const;
  std::string nameOf(const DiagnosticItem& item, double requestedAt) const;
  [[nodiscard]] std::error_code makeRoom(std::uint64_t bytes);
  Bounds readBounds();
  double bound(std::string_view key, double otherwise, std::string& wrong) const;
  void sweep();

  const JsonService& json_;
  const PreferenceStore& preferences_;
  const Clock& clock_;
  const LogCategory& log_;
  const Limits limits_;
  const DiagnosticsDirectory directory_;
  const std::chrono::milliseconds longestItem_;
  CollectorRunner runner_;
  std::string loggedWrongBounds_;  // used by the thread only

  mutable Mutex mutex_;
  Condition changed_;
  std::deque<Pending> pending_ GUARDED_BY(mutex_);
  std::size_t pendingBytes_ GUARDED_BY(mutex_) = 0;
  std::uint64_t refused_ GUARDED_BY(mutex_) = 0;  // since the queue was last empty
  std::uint64_t lost_ GUARDED_BY(mutex_) = 0;     // refused, or not written
  std::chrono::steady_clock::time_point busySince_ GUARDED_BY(mutex_);
  bool isEnding_ GUARDED_BY(mutex_) = false;
  bool isIdle_ GUARDED_BY(mutex_) = true;
  bool sweepIsDue_ GUARDED_BY(mutex_) = false;

  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk

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

#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/diagnostics/collectors/CollectorRunner.h"
#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class JsonService;
class LogCategory;
class PreferenceStore;

// Leaves diagnostics on the disk: for each request a folder with request.json and what the collectors gave.
//
//   add() -> bounded queue -> the store's thread: collect, make room, write, answer
//
// request.json is the item's request and besides
//   "requestedAt"   the date of add()
//   "collected"     the names of the files beside it
//   "problems"      by file name, what is missing or incomplete and why; absent when there is nothing
//
// All items together, of whatever kind, stay within the preferences "max_megabytes" (256) and "max_items"
// (500) of the domain "com.orvane.tonewerk.diagnostics": the oldest go first, before the new one is written.
// They are read for every item. An item that cannot be written (a full disk) leaves nothing behind and is
// logged.
class DiagnosticsStore {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.diagnostics";
  static constexpr std::string_view kMaxMegabytesKey = "max_megabytes";
  static constexpr std::string_view kMaxItemsKey = "max_items";

  struct Limits {
    // More than the capture service can find due at one moment.
    std::size_t pendingItems = 48;
    std::size_t pendingBytes = std::size_t{16} << 20;  // of requests; an item that is alone always fits
    CollectorRunner::Limits collectors = {};
  };

  // Whether the item is on the disk, and under which name. On the store's thread, once.
  using Completion = std::function<void(const std::error_code& error, const std::string& name)>;

  // Items lie in directories of `stateDirectory`, made when they are needed. Everything referred to outlives
  // the store.
  DiagnosticsStore(std::string stateDirectory, std::vector<std::shared_ptr<DiagnosticCollector>> collectors,
                   const JsonService& json, const PreferenceStore& preferences, const Clock& clock,
                   const LogCategory& log, const Limits& limits);
  DiagnosticsStore(const DiagnosticsStore&) = delete;
  DiagnosticsStore& operator=(const DiagnosticsStore&) = delete;
  // finish(0).
  ~DiagnosticsStore();

  // Any thread; never waits. The completion, which may be empty, only runs when this returns no error:
  //   invalid_argument     the name is none that an item may have
  //   no_buffer_space      too much is pending; said in the log
  //   operation_canceled   finish() was called
  // A name that is taken is an error of the completion's, std::errc::file_exists.
  [[nodiscard]] std::error_code add(DiagnosticItem item, Completion completion);

  // Has what a crash left half made removed, on the store's thread. Once it is certain that no other daemon
  // writes here: its half-made items look the same.
  void removeLeftovers();

  // Takes no more items, gives those that are pending `timeout` to be collected for and then has the rest
  // written without evidence. When it has returned no completion runs any more.
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
  CollectorRunner runner_;
  std::string loggedWrongBounds_;  // the thread's own

  Mutex mutex_;
  Condition changed_;
  std::deque<Pending> pending_ GUARDED_BY(mutex_);
  std::size_t pendingBytes_ GUARDED_BY(mutex_) = 0;
  std::uint64_t refused_ GUARDED_BY(mutex_) = 0;  // since the queue was last empty
  bool isEnding_ GUARDED_BY(mutex_) = false;
  bool isIdle_ GUARDED_BY(mutex_) = false;
  bool sweepIsDue_ GUARDED_BY(mutex_) = false;

  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <set>
#include <string>
#include <string_view>
#include <thread>

#include "platform/Log.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "values/GrowingDelay.h"

namespace tonewerk {

// Reports files that are written to or moved into one directory. It runs on a thread of its own.
//
//   closed after writing, renamed into place        -> onFile(name)
//   linked into place, and not empty                -> onFile(name)
//   created, not yet closed after writing           -> nothing
//   the kernel's event queue overflowed             -> onEverything()
//   too many new files at once                      -> onEverything()
//   the directory was created or replaced           -> onEverything()
//
// The kernel sends the same event for a link as for a created file. But a created file must be opened before
// anything can be written to it. So if a file is not empty when its creation event is read, it is taken for a
// link, provided that the kernel has no further events of it, or only that it was opened and closed without
// writing. Otherwise it will be closed after writing, and is reported then.
//
// The directory is identified by its path and need not exist. If it does not exist or cannot be read, the
// nearest existing directory above it is watched until that changes. Only if the system refuses that, too,
// the watcher tries again at intervals that grow from a second to a minute.
class DirectoryWatcher {
 public:
  using FileHandler = std::function<void(std::string_view name)>;

  // As many new files are remembered until it is known whether they were linked.
  static constexpr std::size_t kMaxNewFiles = 1024;
  static constexpr std::chrono::milliseconds kFirstRetry{1'000};
  static constexpr std::chrono::milliseconds kLastRetry{60'000};

  // Reports everything that happens after the constructor has returned. The handlers are called on the
  // watcher's thread, one at a time; the kernel queues events meanwhile. `log` must outlive the watcher.
  DirectoryWatcher(std::string directory, FileHandler onFile, std::function<void()> onEverything,
                   const LogCategory& log);
  DirectoryWatcher(const DirectoryWatcher&) = delete;
  DirectoryWatcher& operator=(const DirectoryWatcher&) = delete;
  // When it returns, no handler is running any more.
  ~DirectoryWatcher();

  // False if the system has no inotify instance or eventfd left. Then no handler is ever called.
  bool isWorking() const { return stop_ && inotify_; }

 private:
  struct Event;

  void run();
  // Reads the events that the kernel has queued, and handles them.
  void readEvents();
  void handle(const Event& event);
  void handleFile(const Event& event);
  void noteNewFile(const std::string& name);
  // Reports the files in unopened_. Called when the kernel's queue is empty.
  void reportLinks();
  // Replaces the watches by watches of the directories that the paths lead to now.
  void attach();
  // Watches the nearest existing directory above. False if none can be watched.
  [[nodiscard]] bool watchAncestor();
  [[nodiscard]] int watch(const std::string& path, std::uint32_t events, int& failure);
  void noteProblem(int failure);
  // poll()'s timeout in milliseconds; -1 for none.
  int pollTimeout();

  const std::string directory_;
  const FileHandler onFile_;
  const std::function<void()> onEverything_;
  const LogCategory& log_;
  const FileDescriptor stop_;  // the destructor makes it readable
  const FileDescriptor inotify_;

  // After the constructor, only the watcher's thread uses these.
  int directoryWatch_ = -1;
  int ancestorWatch_ = -1;
  std::string awaited_;  // the ancestor's entry that is the first part of the path to the directory
  // New files that are not empty, until it is known whether they were linked or are being written.
  std::set<std::string, std::less<>> unopened_;  // not open, according to the events that were read
  std::set<std::string, std::less<>> opened_;    // open, according to the events that were read
  bool mustRetry_ = false;
  int problem_ = 0;  // errno that was logged last; 0 for none
  GrowingDelay retry_{kFirstRetry, kLastRetry};

  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <set>
#include <string>
#include <string_view>
#include <thread>

#include "platform/Log.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "values/GrowingDelay.h"

namespace tonewerk {

// Follows the files that are put into one directory, on a thread of its own.
//
//   closed after writing, renamed into place        -> onFile(name)
//   linked into place: there and not empty          -> onFile(name)
//   created, not yet closed after writing           -> nothing
//   the kernel's event queue overflowed             -> onEverything()
//   the directory came, or another took its place   -> onEverything()
//
// The kernel tells a link like a creation. What tells them apart is that a file which somebody creates has
// been opened before anything can be in it. So one that is not empty when its coming is read is a link if the
// kernel has nothing more to say of it, or nothing but that it was opened and closed unwritten. Else it will
// be closed after writing, and told of then.
//
// The directory is known by its path. It need not be there: the nearest directory above it that is there is
// watched for its coming, or for its becoming readable. Only where the system refuses that is it tried again,
// at intervals that grow from a second to a minute.
class DirectoryWatcher {
 public:
  using FileHandler = std::function<void(std::string_view name)>;

  static constexpr std::chrono::milliseconds kFirstRetry{1'000};
  static constexpr std::chrono::milliseconds kLastRetry{60'000};

  // What comes after the constructor's return is told. The handlers are called on the watcher's thread, one
  // at a time; meanwhile events gather in the kernel. `log` outlives the watcher.
  DirectoryWatcher(std::string directory, FileHandler onFile, std::function<void()> onEverything,
                   const LogCategory& log);
  DirectoryWatcher(const DirectoryWatcher&) = delete;
  DirectoryWatcher& operator=(const DirectoryWatcher&) = delete;
  // No handler runs any more when it returns.
  ~DirectoryWatcher();

  // False where the system refuses to watch anything; then nothing is ever told.
  bool isWorking() const { return stop_ && inotify_; }

 private:
  struct Event;

  void run();
  // Reads what the kernel has gathered.
  void readEvents();
  void handle(const Event& event);
  void handleFile(const Event& event);
  // Those that nobody has open, when the kernel has nothing more to say.
  void tellOfLinks();
  // Watches what the paths lead to now, instead of what they led to before.
  void attach();
  // Watches the nearest directory above that is there. False when there is none to be watched.
  [[nodiscard]] bool watchAncestor();
  [[nodiscard]] int watch(const std::string& path, std::uint32_t events, int& failure);
  void noteProblem(int failure);
  // How long poll() may wait, in milliseconds; -1 for ever.
  int patience();

  const std::string directory_;
  const FileHandler onFile_;
  const std::function<void()> onEverything_;
  const LogCategory& log_;
  const FileDescriptor stop_;  // becomes readable at the end
  const FileDescriptor inotify_;

  // The watcher's thread, after the constructor.
  int directoryWatch_ = -1;
  int ancestorWatch_ = -1;
  std::string awaited_;  // the way to the directory begins with this entry of the ancestor
  // Files that came and were not empty, while it is not known whether they were linked or are being written.
  std::set<std::string, std::less<>> unopened_;  // nobody has them open, as far as the kernel has said
  std::set<std::string, std::less<>> opened_;    // somebody has
  bool mustRetry_ = false;
  int problem_ = 0;  // the one last logged
  GrowingDelay retry_{kFirstRetry, kLastRetry};

  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk

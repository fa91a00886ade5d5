// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/DirectoryWatcher.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kFileEvents = IN_CLOSE | IN_MOVED_TO | IN_CREATE | IN_OPEN | IN_MODIFY;
constexpr std::uint32_t kSelfEvents = IN_DELETE_SELF | IN_MOVE_SELF;
constexpr std::uint32_t kEntryEvents = IN_CREATE | IN_MOVED_TO | IN_MOVED_FROM | IN_DELETE | IN_ATTRIB;

constexpr std::size_t kBufferBytes = std::size_t{16} << 10;

bool holdsSomething(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode) && status.st_size > 0;
}

}  // namespace

struct DirectoryWatcher::Event {
  int watch;
  std::uint32_t what;
  std::string_view name;
};

DirectoryWatcher::DirectoryWatcher(std::string directory, FileHandler onFile,
                                   std::function<void()> onEverything, const LogCategory& log)
    : directory_(std::move(directory)),
      onFile_(std::move(onFile)),
      onEverything_(std::move(onEverything)),
      log_(log),
      stop_(eventfd(0, EFD_CLOEXEC)),
      inotify_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)) {
  if (!stop_ || !inotify_) {
    noteProblem(errno);
    return;
  }
  attach();
  thread_ = std::thread([this] { run(); });
}

DirectoryWatcher::~DirectoryWatcher() {
  if (!thread_.joinable()) return;
  eventfd_write(stop_.get(), 1);
  thread_.join();
}

void DirectoryWatcher::run() {
  nameThisThread("tonewerk.watch");
  for (;;) {
    std::array<pollfd, 2> waited = {pollfd{stop_.get(), POLLIN, 0}, pollfd{inotify_.get(), POLLIN, 0}};
    const bool hasPossibleLinks = !unopened_.empty();
    const int ready = poll(waited.data(), waited.size(), pollTimeout());
    if (waited[0].revents != 0) return;
    if (ready > 0) {
      readEvents();
    } else if (ready == 0 && hasPossibleLinks) {
      reportLinks();
    } else if (ready == 0) {
      attach();
      if (directoryWatch_ >= 0) onEverything_();
    }
  }
}

int DirectoryWatcher::pollTimeout() {
  if (!unopened_.empty()) return 0;
  if (!mustRetry_) return -1;
  return static_cast<int>(std::chrono::duration_cast<std::chrono::milliseconds>(retry_.next()).count());
}

void DirectoryWatcher::readEvents() {
  alignas(inotify_event) std::array<char, kBufferBytes> buffer;
  const ssize_t size = read(inotify_.get(), buffer.data(), buffer.size());
  const char* at = buffer.data();
  const char* const end = at + std::max<ssize_t>(size, 0);
  while (at != end) {
    inotify_event raw{};
    std::memcpy(&raw, at, sizeof(raw));
    const char* const name = at + sizeof(raw);  // padded with zeros
    handle({raw.wd, raw.mask, std::string_view(name, strnlen(name, raw.len))});
    at = name + raw.len;
  }
}

void DirectoryWatcher::handle(const Event& event) {
  const bool isOverflow = (event.what & IN_Q_OVERFLOW) != 0;
  const bool isAncestor = event.watch == ancestorWatch_;
  if (!isOverflow && !isAncestor && event.watch != directoryWatch_) return;  // of a removed watch

  const bool isSelf = (event.what & (kSelfEvents | IN_IGNORED)) != 0;
  // A changed mode matters only while the directory cannot be read.
  const bool mayMatter = (event.what & IN_ATTRIB) == 0 || directoryWatch_ < 0;
  if (isOverflow || isSelf || (isAncestor && event.name == awaited_ && mayMatter)) {
    // After an overflow, a lost event may have been one of the directory itself.
    attach();
    onEverything_();
    return;
  }
  if (!isAncestor && (event.what & IN_ISDIR) == 0) handleFile(event);
}

void DirectoryWatcher::handleFile(const Event& event) {
  const std::string name(event.name);
  if ((event.what & IN_CREATE) != 0) {
    noteNewFile(name);
  } else if ((event.what & IN_OPEN) != 0) {
    if (unopened_.erase(name) > 0) opened_.insert(name);
  } else if ((event.what & IN_CLOSE_NOWRITE) != 0) {
    if (opened_.erase(name) > 0) unopened_.insert(name);
  } else {
    unopened_.erase(name);
    opened_.erase(name);
    if ((event.what & IN_MODIFY) == 0) onFile_(name);  // IN_CLOSE_WRITE or IN_MOVED_TO
  }
}

void DirectoryWatcher::noteNewFile(const std::string& name) {
  opened_.erase(name);  // that was an earlier file with this name
  if (!holdsSomething(directory_ + "/" + name)) return;
  unopened_.insert(name);
  if (unopened_.size() + opened_.size() <= kMaxNewFiles) return;
  unopened_.clear();
  opened_.clear();
  onEverything_();
}

void DirectoryWatcher::reportLinks() {
  for (const std::string& name : std::exchange(unopened_, {})) {
    if (holdsSomething(directory_ + "/" + name)) onFile_(name);
  }
}

int DirectoryWatcher::watch(const std::string& path, std::uint32_t events, int& failure) {
  const int watch = inotify_add_watch(inotify_.get(), path.empty() ? "." : path.c_str(), events | IN_ONLYDIR);
  failure = watch < 0 ? errno : 0;
  return watch;
}

void DirectoryWatcher::attach() {
  // This fails if a watched directory is gone, because the kernel has removed its watch.
  for (const int old : {directoryWatch_, ancestorWatch_}) {
    if (old >= 0) inotify_rm_watch(inotify_.get(), old);
  }
  unopened_.clear();
  opened_.clear();
  // The ancestor is watched first, so that a directory is noticed that is created between the two calls.
  const bool hasAncestor = watchAncestor();
  int failure = 0;
  directoryWatch_ = watch(directory_, kFileEvents | kSelfEvents, failure);
  const bool isMissing = failure == ENOENT || failure == ENOTDIR;
  const bool isAwaited = hasAncestor && (isMissing || failure == EACCES);
  mustRetry_ = directoryWatch_ < 0 && !isAwaited;
  if (!mustRetry_) retry_.reset();
  noteProblem(isMissing ? 0 : failure);
}

bool DirectoryWatcher::watchAncestor() {
  std::filesystem::path below = directory_;
  for (;;) {
    const std::filesystem::path ancestor = below.parent_path();
    int failure = 0;
    ancestorWatch_ = watch(ancestor.string(), kEntryEvents | kSelfEvents, failure);
    awaited_ = below.filename().string();
    if (ancestorWatch_ < 0) {
      if ((failure != ENOENT && failure != ENOTDIR) || ancestor == below || ancestor.empty()) return false;
      below = ancestor;
      continue;
    }
    // The awaited directory may have been created just before the watch was added.
    std::error_code error;
    const bool isLate = below != directory_ && std::filesystem::is_directory(below, error);
    if (!isLate) return true;
    inotify_rm_watch(inotify_.get(), ancestorWatch_);
    below = directory_;
  }
}

void DirectoryWatcher::noteProblem(int failure) {
  if (std::exchange(problem_, failure) == failure || failure == 0) return;
  errorLog(log_, "cannot watch %@: %@", directory_, std::generic_category().message(failure));
}

}  // namespace tonewerk

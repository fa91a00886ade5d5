// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sched.h>
#include <string>
#include <sys/mount.h>
#include <utility>

namespace tonewerk {

// Mounts a small file system that only this process and its children see, so that nothing of it remains,
// however the test ends. Only root can make one. Only threads that are started later see it.
class SmallFileSystem {
 public:
  explicit SmallFileSystem(std::string path) : path_(std::move(path)) {
    isMounted_ = ::unshare(CLONE_NEWNS) == 0 &&
                 ::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
                 ::mount("tonewerk-test", path_.c_str(), "tmpfs", 0, "size=1m") == 0;
  }
  SmallFileSystem(const SmallFileSystem&) = delete;
  SmallFileSystem& operator=(const SmallFileSystem&) = delete;
  ~SmallFileSystem() {
    if (isMounted_) ::umount2(path_.c_str(), MNT_DETACH);
  }

  bool isMounted() const { return isMounted_; }
  // Enlarges the file system. Returns false when that failed.
  [[nodiscard]] bool grow() {
    return ::mount("tonewerk-test", path_.c_str(), "tmpfs", MS_REMOUNT, "size=64m") == 0;
  }

 private:
  const std::string path_;
  bool isMounted_ = false;
};

}  // namespace tonewerk

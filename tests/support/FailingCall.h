// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <linux/seccomp.h>
#include <optional>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <vector>

namespace tonewerk {

// What a system call does instead of its work.
enum class Fault {
  kNoSpace,  // fails, as on a full disk
  kBroken,   // fails, as on a broken disk
  kShort,    // a write takes a part; other calls do their work
};

// Lets the n-th call of those that a test intercepts (support/InterceptedCalls.h) fail, and the `count` - 1
// after it, and counts them. After a short write the disk is full. It uses descriptors of the thread that
// waits for it, and ThreadSanitizer sees no order between the two, so its own calls go to the kernel
// directly.
//
// Any thread may call disarm().
class FailingCall {
 public:
  // The calls that write. Not those that remove something: what they leave behind is removed at the next
  // start.
  static std::vector<long> writingCalls() {
    return {SYS_open,     SYS_openat,    SYS_write,  SYS_fsync, SYS_fdatasync, SYS_rename,
            SYS_renameat, SYS_renameat2, SYS_linkat, SYS_mkdir, SYS_fchmod,    SYS_flock};
  }

  FailingCall(int nth, Fault fault, int count = 1) : nth_(nth), fault_(fault), count_(count) {}

  std::optional<std::int64_t> operator()(const seccomp_data& call) {
    if (isDisarmed_) return std::nullopt;
    const bool isWrite = call.nr == SYS_write || call.nr == SYS_pwrite64;
    if (isWrite && !isFile(static_cast<int>(call.args[0]))) return std::nullopt;
    ++calls_;
    if (calls_ < nth_ || calls_ >= nth_ + count_) return std::nullopt;
    if (fault_ == Fault::kNoSpace) return -ENOSPC;
    if (fault_ == Fault::kBroken) return -EIO;
    if (calls_ > nth_) return -ENOSPC;
    if (!isWrite || call.args[2] < kShortestCut) return std::nullopt;
    return ::syscall(call.nr, static_cast<int>(call.args[0]), call.args[1], call.args[2] / 2, call.args[3]);
  }

  bool wasReached() const { return calls_ >= nth_; }
  // From now on nothing fails, and nothing is counted.
  void disarm() { isDisarmed_ = true; }

 private:
  // A file system takes so few bytes whole, or the disk is full.
  static constexpr std::uint64_t kShortestCut = 64;

  // The sanitizers write to pipes, to see what they can read.
  static bool isFile(int descriptor) {
    struct stat status {};
    return ::syscall(SYS_fstat, descriptor, &status) == 0 && S_ISREG(status.st_mode);
  }

  const int nth_;
  const Fault fault_;
  const int count_;
  int calls_ = 0;
  std::atomic<bool> isDisarmed_ = false;
};

}  // namespace tonewerk

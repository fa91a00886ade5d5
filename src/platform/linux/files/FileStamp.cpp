// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/FileStamp.h"

#include <ctime>

namespace tonewerk {
namespace {

constexpr std::int64_t kSecond = 1'000'000'000;

std::int64_t nanosecondsOf(const timespec& time) { return time.tv_sec * kSecond + time.tv_nsec; }

}  // namespace

FileStamp FileStamp::of(const struct stat& status) {
  return {status.st_dev,
          status.st_ino,
          status.st_size,
          nanosecondsOf(status.st_mtim),
          nanosecondsOf(status.st_ctim),
          status.st_uid};
}

bool FileStamp::isSettled() const {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return nanosecondsOf(now) - changedNanoseconds > kSecond;
}

}  // namespace tonewerk

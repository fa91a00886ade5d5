// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/LinuxDetachedThreads.h"

#include <string>
#include <thread>
#include <utility>

#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {
namespace {

constexpr int kNiceness = 5;  // otherwise a thread inherits the niceness of the thread that starts it

}  // namespace

std::error_code LinuxDetachedThreads::start(std::string_view name, Task work) {
  try {
    std::thread([name = std::string(name), work = std::move(work)]() mutable {
      nameThisThread(name);
      setNicenessOfThisThread(kNiceness);
      work();
    }).detach();
  } catch (const std::system_error& error) {
    return error.code();
  }
  return {};
}

}  // namespace tonewerk

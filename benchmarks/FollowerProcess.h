// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <sys/types.h>

namespace tonewerk {

// Runs a reader in a process of its own, as the readers of a store are. The process ends with the object, or
// with the process that made it.
class FollowerProcess {
 public:
  // `follow` returns when it has read everything. Call it before any thread is started.
  explicit FollowerProcess(const std::function<void()>& follow);
  FollowerProcess(const FollowerProcess&) = delete;
  FollowerProcess& operator=(const FollowerProcess&) = delete;
  ~FollowerProcess();

  // Waits until `follow` has returned. Throws std::runtime_error when it has failed; it has printed why.
  void join();

 private:
  pid_t process_ = -1;
};

// Reads the events of a daemon's store by increasing identifier, and waits for more until it has read `rows`
// of them. Throws std::runtime_error when they do not come.
void followStore(const std::string& storePath, std::size_t rows);

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

#include "platform/CommandRunner.h"
#include "values/Mutex.h"

namespace tonewerk {

// Runs commands that end as the test says. A command about which the test says nothing cannot be started. Any
// thread.
//
//   test.commands.answer("slabtop --once", "a line\n");
//   test.commands.answer("tool", {"half a li", CommandRunner::End::kTooLong});
//   test.commands.hold("tool");                  // its run() returns after release()
class MemoryCommandRunner final : public CommandRunner {
 public:
  struct Run {
    std::string command;
    Limits limits;
  };

  [[nodiscard]] Result run(const std::string& command, const Limits& limits) override;

  void answer(const std::string& command, Result result);
  void answer(const std::string& command, std::string output) {
    answer(command, Result{std::move(output), End::kExited, 0});
  }
  void hold(const std::string& command);
  void release(const std::string& command);

  // Returns the runs in the order in which they began.
  std::vector<Run> runs() const;
  // Returns when `count` runs have begun.
  void waitForRuns(std::size_t count);

 private:
  mutable Mutex mutex_;
  Condition changed_;
  std::map<std::string, Result> answers_ GUARDED_BY(mutex_);
  std::set<std::string> held_ GUARDED_BY(mutex_);
  std::vector<Run> runs_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk

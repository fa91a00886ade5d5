// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/commands/LinuxCommandRunner.h"

#include <filesystem>
#include <system_error>
#include <utility>

#include "platform/linux/commands/BoundedCommand.h"

namespace tonewerk {
namespace {

constexpr int kStatusNotExecutable = 126;
constexpr int kStatusNotFound = 127;

// Passes the directory and the command as arguments, so that they need no quoting.
constexpr const char* kRunFirstArgument = R"(PATH="$0${PATH:+:$PATH}"; export PATH; eval "$1")";

std::string directoryOfThisExecutable() {
  std::error_code error;
  return std::filesystem::read_symlink("/proc/self/exe", error).parent_path().string();
}

CommandRunner::End endOf(const BoundedCommand::Result& result) {
  switch (result.end) {
    case BoundedCommand::End::kExited: {
      const bool isShellsStatus = result.status == kStatusNotExecutable || result.status == kStatusNotFound;
      return isShellsStatus && result.output.empty() ? CommandRunner::End::kNotStarted
                                                     : CommandRunner::End::kExited;
    }
    case BoundedCommand::End::kSignalled:
      return CommandRunner::End::kSignalled;
    case BoundedCommand::End::kTimedOut:
      return CommandRunner::End::kTooLong;
    case BoundedCommand::End::kTooMuchOutput:
      return CommandRunner::End::kTooMuch;
    case BoundedCommand::End::kNotStarted:
      break;
  }
  return CommandRunner::End::kNotStarted;
}

}  // namespace

LinuxCommandRunner::LinuxCommandRunner() : ownDirectory_(directoryOfThisExecutable()) {}

CommandRunner::Result LinuxCommandRunner::run(const std::string& command, const Limits& limits) {
  BoundedCommand::Result result = BoundedCommand({"/bin/sh", "-c", kRunFirstArgument, ownDirectory_, command},
                                                 {.time = limits.time, .bytes = limits.bytes})
                                      .run();
  const End end = endOf(result);
  return {std::move(result.output), end, result.status};
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/OfflineProgram.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tonewerk {
namespace {

// What a new process does with its descriptors.
class FileActions {
 public:
  FileActions() { posix_spawn_file_actions_init(&actions_); }
  FileActions(const FileActions&) = delete;
  FileActions& operator=(const FileActions&) = delete;
  ~FileActions() { posix_spawn_file_actions_destroy(&actions_); }

  [[nodiscard]] int open(int descriptor, const char* file, int flags) {
    return posix_spawn_file_actions_addopen(&actions_, descriptor, file, flags, S_IRUSR | S_IWUSR);
  }
  const posix_spawn_file_actions_t* get() const { return &actions_; }

 private:
  posix_spawn_file_actions_t actions_{};
};

}  // namespace

std::string offlineProgram() {
  std::error_code error;
  const std::filesystem::path executable = std::filesystem::read_symlink("/proc/self/exe", error);
  return executable.parent_path() / "tw-replay";
}

std::error_code runProgram(std::vector<std::string> words, const std::string& output, int& status) {
  std::vector<char*> arguments;
  arguments.reserve(words.size() + 1);
  for (std::string& word : words) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  FileActions actions;
  int error = 0;
  if (!output.empty()) {
    error = actions.open(STDOUT_FILENO, output.c_str(), O_WRONLY | O_CREAT | O_EXCL);
    if (error == 0) error = actions.open(STDERR_FILENO, "/dev/null", O_WRONLY);
  }
  pid_t process = 0;
  if (error == 0)
    error = posix_spawn(&process, arguments[0], actions.get(), nullptr, arguments.data(), environ);
  if (error != 0) return {error, std::generic_category()};
  while (waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  return {};
}

}  // namespace tonewerk

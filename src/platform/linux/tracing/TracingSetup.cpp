// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/TracingSetup.h"

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/TextFile.h"
#include "tonewerk/signpost.h"

namespace tonewerk {

std::string signpostLibraryName() {
  const char* path = ::secure_getenv("TONEWERK_SIGNPOSTS");
  return path != nullptr && path[0] == '/' ? path : signpost::kProviderLibrary;
}

std::string tracesDirectory(const std::string& stateDirectory) {
  std::error_code error;  // if there is no working directory, the path stays relative
  const std::filesystem::path absolute = std::filesystem::absolute(stateDirectory, error);
  return (error ? std::filesystem::path(stateDirectory) : absolute) / "traces";
}

std::string traceReaderPath() {
  std::error_code error;  // after an error, only the name is returned, and PATH is searched for it
  const std::filesystem::path executable = std::filesystem::read_symlink("/proc/self/exe", error);
  return executable.parent_path() / "tw-trace-reader";
}

std::error_code setSignpostMark(const std::string& runtimeDirectory, bool canBeTraced) {
  const std::string path = runtimeDirectory + "/" + signpost::kMarkName;
  if (!canBeTraced) {
    return ::unlink(path.c_str()) == 0 || errno == ENOENT ? std::error_code() : lastSystemError();
  }
  const FileDescriptor file(::open(path.c_str(), O_WRONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0644));
  return file ? std::error_code() : lastSystemError();
}

}  // namespace tonewerk

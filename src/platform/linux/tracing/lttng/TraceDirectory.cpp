// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/TraceDirectory.h"

#include <filesystem>
#include <sys/stat.h>

#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr mode_t kMode = 0700;

void removeAll(const std::filesystem::path& path) {
  std::error_code error;  // the next start tries to remove the rest
  std::filesystem::remove_all(path, error);
}

}  // namespace

std::shared_ptr<TraceDirectory> TraceDirectory::make(const std::string& parent, const std::string& name,
                                                     std::error_code& error) {
  error.clear();
  std::filesystem::create_directories(parent, error);
  if (error) return nullptr;
  const std::string path = parent + "/" + name;
  if (::mkdir(path.c_str(), kMode) != 0) {
    error = lastSystemError();
    return nullptr;
  }
  return std::make_shared<TraceDirectory>(path);
}

void TraceDirectory::removeLeftovers(const std::string& parent) {
  std::error_code error;
  for (std::filesystem::directory_iterator at(parent, error), end; !error && at != end; at.increment(error)) {
    removeAll(at->path());
  }
}

TraceDirectory::~TraceDirectory() { removeAll(path_); }

}  // namespace tonewerk

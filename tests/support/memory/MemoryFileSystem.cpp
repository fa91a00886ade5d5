// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryFileSystem.h"

#include <cassert>
#include <string_view>

namespace tonewerk {
namespace {

constexpr std::size_t kMaxNameBytes = 255;

bool isPlainName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
         name.find('\0') == std::string_view::npos;
}

}  // namespace

class MemoryFileSystem::File final : public NewFile {
 public:
  File(std::shared_ptr<State> state, std::string directory)
      : state_(std::move(state)), directory_(std::move(directory)) {}
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  ~File() override {
    const MutexLock lock(state_->mutex);
    if (!isPlaced_) --state_->openFiles;
  }

  [[nodiscard]] std::error_code write(std::string_view text) override {
    const MutexLock lock(state_->mutex);
    assert(!isPlaced_);
    if (state_->writesUntilFailure > 0 && --state_->writesUntilFailure == 0) {
      if (!failure_) failure_ = std::make_error_code(state_->writeFailure);
      return std::make_error_code(state_->writeFailure);
    }
    text_ += text;
    return {};
  }

  [[nodiscard]] std::error_code place(const std::string& name) override {
    const MutexLock lock(state_->mutex);
    assert(!isPlaced_);
    if (!isPlainName(name)) return std::make_error_code(std::errc::invalid_argument);
    if (failure_) return failure_;
    if (state_->placeFailure != std::errc()) return std::make_error_code(state_->placeFailure);
    const std::string path = directory_ + "/" + name;
    if (state_->holds(path)) return std::make_error_code(std::errc::file_exists);
    state_->files[path] = std::move(text_);
    state_->times[path] = state_->placed++;
    isPlaced_ = true;
    --state_->openFiles;
    return {};
  }

 private:
  std::shared_ptr<State> state_;
  const std::string directory_;
  std::string text_;
  std::error_code failure_;
  bool isPlaced_ = false;
};

MemoryFileSystem::MemoryFileSystem() : state_(std::make_shared<State>()) { state_->directories["/"] = 0755; }

std::error_code MemoryFileSystem::createDirectories(const std::string& path, unsigned mode) {
  const MutexLock lock(state_->mutex);
  if (state_->createDirectoriesFailure != std::errc()) {
    return std::make_error_code(state_->createDirectoriesFailure);
  }
  for (std::size_t slash = path.find('/', 1);; slash = path.find('/', slash + 1)) {
    const std::string part = path.substr(0, slash);
    if (state_->files.contains(part)) return std::make_error_code(std::errc::not_a_directory);
    state_->directories.try_emplace(part, mode);
    if (slash == std::string::npos) return {};
  }
}

std::unique_ptr<NewFile> MemoryFileSystem::createFile(const std::string& directory, const std::string& name,
                                                      std::error_code& error) {
  const MutexLock lock(state_->mutex);
  error.clear();
  if (state_->createFileFailure != std::errc()) {
    error = std::make_error_code(state_->createFileFailure);
  } else if (!isPlainName(name)) {
    error = std::make_error_code(std::errc::invalid_argument);
  } else if (!state_->directories.contains(directory)) {
    error = std::make_error_code(std::errc::no_such_file_or_directory);
  } else if (name.size() > kMaxNameBytes) {
    error = std::make_error_code(std::errc::filename_too_long);
  } else if (state_->holds(directory + "/" + name)) {
    error = std::make_error_code(std::errc::file_exists);
  }
  if (error) return nullptr;
  ++state_->openFiles;
  return std::make_unique<File>(state_, directory);
}

bool MemoryFileSystem::exists(const std::string& path) const {
  const MutexLock lock(state_->mutex);
  return state_->holds(path);
}

std::error_code MemoryFileSystem::readFile(const std::string& path, std::string& text) const {
  const MutexLock lock(state_->mutex);
  if (state_->readFailure != std::errc()) return std::make_error_code(state_->readFailure);
  if (state_->directories.contains(path)) return std::make_error_code(std::errc::is_a_directory);
  const auto found = state_->files.find(path);
  if (found == state_->files.end()) return std::make_error_code(std::errc::no_such_file_or_directory);
  text = found->second;
  return {};
}

std::error_code MemoryFileSystem::moveFile(const std::string& from, const std::string& directory,
                                           const std::string& name) {
  const MutexLock lock(state_->mutex);
  if (state_->moveFailure != std::errc()) return std::make_error_code(state_->moveFailure);
  if (!isPlainName(name)) return std::make_error_code(std::errc::invalid_argument);
  if (state_->directories.contains(from) || state_->links.contains(from)) {
    return std::make_error_code(std::errc::operation_not_permitted);
  }
  const std::string to = directory + "/" + name;
  const bool hasPlace = state_->files.contains(from) && state_->directories.contains(directory);
  if (!hasPlace) return std::make_error_code(std::errc::no_such_file_or_directory);
  if (state_->holds(to)) return std::make_error_code(std::errc::file_exists);
  auto node = state_->files.extract(from);
  node.key() = to;
  state_->files.insert(std::move(node));
  return {};
}

std::vector<FileEntry> MemoryFileSystem::listFiles(const std::string& directory,
                                                   std::error_code& error) const {
  const MutexLock lock(state_->mutex);
  error.clear();
  if (!state_->directories.contains(directory)) {
    error = std::make_error_code(std::errc::no_such_file_or_directory);
  }
  std::vector<FileEntry> entries;
  for (const auto& [path, text] : state_->files) {
    const std::size_t slash = path.rfind('/');
    if (path.substr(0, slash) != directory) continue;
    const auto time = state_->times.find(path);
    entries.push_back(
        {path.substr(slash + 1), text.size(), time == state_->times.end() ? 0.0 : time->second});
  }
  return entries;
}

std::error_code MemoryFileSystem::removeFile(const std::string& path) {
  const MutexLock lock(state_->mutex);
  if (state_->removeFailure != std::errc()) return std::make_error_code(state_->removeFailure);
  if (state_->directories.contains(path)) return std::make_error_code(std::errc::is_a_directory);
  if (state_->files.erase(path) + state_->links.erase(path) > 0) return {};
  return std::make_error_code(std::errc::no_such_file_or_directory);
}

void MemoryFileSystem::removeLeftovers(const std::string& directory) {
  const MutexLock lock(state_->mutex);
  state_->swept.push_back(directory);
}

void MemoryFileSystem::failCreateDirectories(std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->createDirectoriesFailure = error;
}

void MemoryFileSystem::failCreateFile(std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->createFileFailure = error;
}

void MemoryFileSystem::failWrite(int nth, std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->writesUntilFailure = nth;
  state_->writeFailure = error;
}

void MemoryFileSystem::failPlace(std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->placeFailure = error;
}

void MemoryFileSystem::failReadFile(std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->readFailure = error;
}

void MemoryFileSystem::failMoveFile(std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->moveFailure = error;
}

void MemoryFileSystem::failRemoveFile(std::errc error) {
  const MutexLock lock(state_->mutex);
  state_->removeFailure = error;
}

void MemoryFileSystem::addFile(const std::string& path, std::string text, double modifiedAt) {
  static_cast<void>(createDirectories(path.substr(0, path.rfind('/')), 0755));
  const MutexLock lock(state_->mutex);
  state_->times[path] = modifiedAt;
  state_->files[path] = std::move(text);
}

void MemoryFileSystem::addSymbolicLink(const std::string& path) {
  const MutexLock lock(state_->mutex);
  state_->links.insert(path);
}

std::optional<std::string> MemoryFileSystem::contents(const std::string& path) const {
  const MutexLock lock(state_->mutex);
  const auto found = state_->files.find(path);
  return found == state_->files.end() ? std::nullopt : std::optional(found->second);
}

std::vector<std::string> MemoryFileSystem::files() const {
  const MutexLock lock(state_->mutex);
  std::vector<std::string> paths;
  for (const auto& [path, text] : state_->files) paths.push_back(path);
  return paths;
}

std::optional<unsigned> MemoryFileSystem::directoryMode(const std::string& path) const {
  const MutexLock lock(state_->mutex);
  const auto found = state_->directories.find(path);
  return found == state_->directories.end() ? std::nullopt : std::optional(found->second);
}

std::vector<std::string> MemoryFileSystem::swept() const {
  const MutexLock lock(state_->mutex);
  return state_->swept;
}

int MemoryFileSystem::openFiles() const {
  const MutexLock lock(state_->mutex);
  return state_->openFiles;
}

}  // namespace tonewerk

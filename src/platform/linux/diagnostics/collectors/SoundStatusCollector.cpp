// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/SoundStatusCollector.h"

#include <algorithm>
#include <filesystem>
#include <system_error>
#include <vector>

#include "platform/linux/files/TextFile.h"
#include "values/ShortenedText.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

// Finds at most `maxFiles` regular files and sorts their paths. Links are left out: they are the cards'
// names, and lead to directories that are visited anyway.
std::error_code findFiles(const std::string& directory, int depth, std::size_t maxFiles,
                          std::vector<std::string>& found) {
  std::error_code error;
  fs::recursive_directory_iterator at(directory, error);
  for (const fs::recursive_directory_iterator end; !error && at != end; at.increment(error)) {
    if (at.depth() >= depth) at.disable_recursion_pending();
    std::error_code unknown;
    if (!fs::is_regular_file(at->symlink_status(unknown))) continue;
    if (found.size() == maxFiles) break;
    found.push_back(at->path().string());
  }
  std::sort(found.begin(), found.end());
  return error;
}

}  // namespace

DiagnosticCollector::Result SoundStatusCollector::collect() {
  Result result;
  std::vector<std::string> paths;
  const std::error_code error = findFiles(directory_, limits_.depth, limits_.files + 1, paths);
  if (error) result.problem = directory_ + ": " + error.message();
  if (paths.size() > limits_.files) {
    paths.resize(limits_.files);
    result.problem = "more than " + std::to_string(limits_.files) + " files";
  }
  for (const std::string& path : paths) {
    std::string text;
    const std::error_code failed = readTextFile(path, text);
    if (failed) text = "(" + failed.message() + ")";
    if (text.size() > limits_.fileBytes) text = std::string(shortened(text, limits_.fileBytes)) + "\n(cut)";
    if (text.empty() || text.back() != '\n') text += '\n';
    if (result.text.size() + path.size() + text.size() > limits_.bytes) {
      result.problem = "more than " + std::to_string(limits_.bytes) + " bytes";
      break;
    }
    result.text.append("== ").append(path).append("\n").append(text);
  }
  return result;
}

}  // namespace tonewerk

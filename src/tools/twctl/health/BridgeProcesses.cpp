// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/BridgeProcesses.h"

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <fstream>
#include <sys/stat.h>
#include <system_error>

namespace tonewerk {
namespace {

constexpr const char* kName = "tw-pipewire";

}  // namespace

std::vector<BridgeProcess> findBridges(const std::string& processes) {
  std::vector<BridgeProcess> bridges;
  std::error_code error;
  std::filesystem::directory_iterator entry(processes, error);
  for (const std::filesystem::directory_iterator end; !error && entry != end; entry.increment(error)) {
    const std::string text = entry->path().filename().string();
    BridgeProcess process;
    const auto [last, failure] = std::from_chars(text.data(), text.data() + text.size(), process.identifier);
    if (failure != std::errc() || last != text.data() + text.size()) continue;
    std::string name;
    std::ifstream file(entry->path() / "comm");
    struct stat status {};
    if (!std::getline(file, name) || name != kName || stat(entry->path().c_str(), &status) != 0) continue;
    process.user = status.st_uid;
    bridges.push_back(process);
  }
  std::sort(bridges.begin(), bridges.end(),
            [](const BridgeProcess& a, const BridgeProcess& b) { return a.identifier < b.identifier; });
  return bridges;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/ProbeListReader.h"

#include <algorithm>
#include <optional>

#include "platform/FileSystem.h"
#include "platform/JsonService.h"
#include "platform/Kolvi.h"

namespace tonewerk {
namespace {

bool isTraceable(const std::string& name) {
  return !name.empty() && name.size() <= WantedSignposts::kMaxNameBytes &&
         std::none_of(name.begin(), name.end(), [](char c) {
           constexpr char kDelete = '\x7F';
           return static_cast<unsigned char>(c) < ' ' || c == kDelete || c == '"';
         });
}

std::string problemOf(const std::set<std::string>& names) {
  if (names.empty()) return "names no signpost";
  if (names.size() > WantedSignposts::kMax) {
    return "names more than " + std::to_string(WantedSignposts::kMax) + " signposts";
  }
  const bool areTraceable = std::all_of(names.begin(), names.end(), isTraceable);
  return areTraceable ? "" : "holds a name that no signpost can have";
}

}  // namespace

WantedSignposts readWantedSignposts(const std::string& path, const FileSystem& files,
                                    const JsonService& json) {
  const std::string list = "the probe list " + path + " ";
  WantedSignposts wanted;
  std::string text;
  if (const std::error_code error = files.readFile(path, text)) {
    wanted.problem = list + "cannot be read: " + error.message();
    return wanted;
  }
  std::string problem;
  const std::optional<Value> root = json.parse(text, problem);
  const std::optional<ValueArray> probes = root ? probeDictionariesOf(*root) : std::nullopt;
  if (!root) {
    wanted.problem = list + "is no JSON: " + problem;
  } else if (!probes) {
    wanted.problem = list + "holds neither probes nor a probe";
  } else {
    wanted.names = signpostsOf(*probes);
    problem = problemOf(wanted.names);
    if (!problem.empty()) wanted.problem = list + problem;
  }
  return wanted;
}

}  // namespace tonewerk

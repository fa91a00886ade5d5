// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/RecordingFile.h"

#include <cerrno>
#include <fstream>
#include <system_error>

namespace tonewerk {

std::optional<Recording> readRecordingFile(const std::string& file, const RequestSet& interface,
                                           const JsonService& json, std::string& problem) {
  errno = 0;
  std::ifstream text(file);
  std::optional<Recording> recording;
  if (text) recording = Recording::read(text, interface, json, problem);
  // A directory can be opened, but reading it fails.
  if (text.is_open() && !text.bad()) return recording;
  problem = std::generic_category().message(errno != 0 ? errno : EIO);
  return std::nullopt;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/RecentLines.h"

#include <utility>

#include "values/ShortenedText.h"

namespace tonewerk {

void RecentLines::add(std::string_view line) {
  if (!line.empty() && line.back() == '\n') line.remove_suffix(1);
  std::string kept(shortened(line, limits_.lineBytes - 1));
  kept += '\n';
  const MutexLock lock(mutex_);
  bytes_ += kept.size();
  lines_.push_back(std::move(kept));
  while (lines_.size() > limits_.lines || bytes_ > limits_.bytes) {
    bytes_ -= lines_.front().size();
    lines_.pop_front();
  }
}

std::string RecentLines::text() const {
  const MutexLock lock(mutex_);
  std::string text;
  text.reserve(bytes_);
  for (const std::string& line : lines_) text += line;
  return text;
}

}  // namespace tonewerk

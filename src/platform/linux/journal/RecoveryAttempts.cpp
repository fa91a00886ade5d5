// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/RecoveryAttempts.h"

#include <charconv>
#include <filesystem>
#include <fstream>
#include <system_error>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

// 0 for a text that is no number.
int numberIn(const std::string& text) {
  int number = 0;
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

}  // namespace

RecoveryAttempts::RecoveryAttempts(std::string directory, const LogCategory& log)
    : directory_(std::move(directory)), log_(log) {
  std::string text;
  if (readTextFile(path(), text)) return;
  begun_ = numberIn(text);
  if (begun_ < kMost) return;
  const std::string aside = directory_ + ".failed";
  std::error_code error;
  std::filesystem::remove_all(aside, error);
  std::filesystem::rename(directory_, aside, error);
  if (error) {
    errorLog(log_, "cannot move %s aside: %s", directory_, error.message());
    return;
  }
  errorLog(log_, "%d starts have not recovered sessions from %s; it is moved to %s", begun_, directory_,
           aside);
  begun_ = 0;
}

void RecoveryAttempts::begin() {
  std::ofstream file(path(), std::ios::trunc);
  file << ++begun_ << '\n' << std::flush;
  if (!file) errorLog(log_, "cannot write %s", path());
}

void RecoveryAttempts::finish() {
  std::error_code error;
  std::filesystem::remove(path(), error);
  begun_ = 0;
}

std::string RecoveryAttempts::path() const { return directory_ + "/attempts"; }

}  // namespace tonewerk

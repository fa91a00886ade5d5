// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/SummaryJsonFile.h"

#include <array>
#include <cassert>
#include <charconv>
#include <limits>

#include "platform/FileSystem.h"
#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"
#include "values/PrettyJson.h"

namespace tonewerk {
namespace {

constexpr unsigned kDirectoryMode = 0777;
constexpr std::string_view kExtension = ".json";
// The lines of many messages take one write, and such a block is written without a copy.
constexpr std::size_t kBlockBytes = std::size_t{256} << 10;

}  // namespace

std::string SummaryJsonFile::numbered(const std::string& name, std::size_t number) {
  if (number == 1) return name;
  return name.substr(0, name.size() - kExtension.size()) + "-" + std::to_string(number) +
         std::string(kExtension);
}

SummaryJsonFile::SummaryJsonFile(std::string directory, std::string name)
    : directory_(std::move(directory)), name_(std::move(name)) {
  assert(name_.ends_with(kExtension));
}

SummaryJsonFile::~SummaryJsonFile() = default;

void SummaryJsonFile::openFile() {
  FileSystem& files = TWReportingContext::current().platform().files;
  if (const std::error_code error = files.createDirectories(directory_, kDirectoryMode)) {
    errorLog(TWReportingSummaryLogCategory(), "can't create logging directory at %@: %@", directory_,
             error.message());
  }
  const std::error_code error = withFreeName([&](const std::string& name) {
    std::error_code problem;
    reportFileHandle_ = files.createFile(directory_, name, problem);
    return problem;
  });
  if (reportFileHandle_ == nullptr) {
    errorLog(TWReportingSummaryLogCategory(),
             "SummaryJsonFileWorker failed to open file. action=open file=%@ error=\"%@\"", reportPath_,
             error.message());
    return;
  }
  infoLog(TWReportingSummaryLogCategory(), "SummaryJsonFileWorker opened file. action=open file=%@",
          reportPath_);
  hasLoggedLine_ = false;
  writeLine("[");
}

std::error_code SummaryJsonFile::withFreeName(
    const std::function<std::error_code(const std::string& name)>& attempt) {
  for (;; ++nameNumber_) {
    const std::string name = numbered(name_, nameNumber_);
    reportPath_ = directory_ + "/" + name;
    const std::error_code error = attempt(name);
    if (error != std::errc::file_exists) return error;
  }
}

void SummaryJsonFile::writeLine(std::string_view text) {
  if (reportFileHandle_ == nullptr) return;
  bytes_ += text.size() + 1;
  // Only a failure to write the line's end is logged: a file that refuses the text refuses the end, too. All
  // later lines fail with the same error, so that is logged once. The file does not appear then, and
  // closeFile() logs that.
  static_cast<void>(reportFileHandle_->write(text));
  const std::error_code error = reportFileHandle_->write("\n");
  if (error && !std::exchange(hasLoggedLine_, true)) {
    errorLog(TWReportingSummaryLogCategory(),
             "SummaryJsonFileWorker failed to write line. action=writeline file=%@ error=\"%@\"", reportPath_,
             error.message());
  }
}

void SummaryJsonFile::writeCollected() {
  if (lines_.empty()) return;
  writeLine(std::string_view(lines_).substr(0, lines_.size() - 1));
  lines_.clear();
  Heartbeat::beatHere();
}

void SummaryJsonFile::writeMessage(AudioEventCategory category, AudioEventType type,
                                   const ValueMap& payload) {
  if (reportPath_.empty()) openFile();
  const std::string_view member = nextMember(kindOf(category, type));
  const std::size_t before = lines_.size();
  std::string problem;
  if (hasEntry_) lines_ += ",\n";
  if (!appendPrettyJson(lines_, member, payload, problem)) {
    lines_.resize(before);
    writeCollected();  // because its failure is logged first
    errorLog(TWReportingSummaryLogCategory(), "dataWithJSONObject: %@", problem);
    writeLine("");  // in place of the entry; the array continues without it
    return;
  }
  hasEntry_ = true;
  lines_ += '\n';
  if (lines_.size() >= kBlockBytes) writeCollected();
}

std::string_view SummaryJsonFile::nextMember(const Kind& kind) {
  std::array<char, std::numeric_limits<std::size_t>::digits10 + 1> digits;
  char* const end = std::to_chars(digits.data(), digits.data() + digits.size(), ++*kind.count).ptr;
  member_.assign(kind.name);
  member_ += '_';
  member_.append(digits.data(), end);
  return member_;
}

const SummaryJsonFile::Kind& SummaryJsonFile::kindOf(AudioEventCategory category, AudioEventType type) {
  const auto [place, isNew] = kinds_.try_emplace({category, type});
  Kind& kind = place->second;
  if (isNew) {
    kind.name = TWReportingUtilityCategoryString(category) + "_" + TWReportingUtilityTypeString(type);
    kind.count = &counts_[kind.name];
  }
  return kind;
}

bool SummaryJsonFile::closeFile() {
  writeCollected();
  writeLine("]");
  const bool isWritten = reportPath_.empty() || reportFileHandle_ != nullptr;
  std::error_code error;
  if (reportFileHandle_ != nullptr) {
    error = withFreeName([this](const std::string& name) { return reportFileHandle_->place(name); });
  }
  if (error) {
    errorLog(TWReportingSummaryLogCategory(),
             "SummaryJsonFileWorker failed to closed file. action=close file=%@ error=\"%@\"", reportPath_,
             error.message());
  } else {
    const Value path(reportPath_);
    infoLog(TWReportingSummaryLogCategory(), "SummaryJsonFileWorker closed file. action=close file=%@",
            reportPath_.empty() ? nullptr : &path);
  }
  reportFileHandle_.reset();
  reportPath_.clear();
  return isWritten && !error;
}

}  // namespace tonewerk

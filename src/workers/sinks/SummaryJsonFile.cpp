// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/SummaryJsonFile.h"

#include <cassert>
#include <string_view>
#include <system_error>
#include <utility>

#include "platform/FileSystem.h"
#include "platform/JsonService.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr unsigned kDirectoryMode = 0777;
constexpr std::string_view kExtension = ".json";

std::string numbered(const std::string& name, std::size_t number) {
  if (number == 1) return name;
  return name.substr(0, name.size() - kExtension.size()) + "-" + std::to_string(number) +
         std::string(kExtension);
}

}  // namespace

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

void SummaryJsonFile::writeMessage(AudioEventCategory category, AudioEventType type,
                                   const ValueMap& payload) {
  if (reportPath_.empty()) openFile();
  const Kind& kind = kindOf(category, type);
  const std::string member = kind.name + "_" + std::to_string(++*kind.count);
  std::string problem;
  const auto text =
      TWReportingContext::current().platform().json.pretty(ValueMap{{member, payload}}, problem);
  if (!text) {
    errorLog(TWReportingSummaryLogCategory(), "dataWithJSONObject: %@", problem);
    writeLine("");  // in place of the entry; the array continues without it
    return;
  }
  if (std::exchange(hasEntry_, true)) writeLine(",");
  writeLine(*text);
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

void SummaryJsonFile::closeFile() {
  writeLine("]");
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
}

}  // namespace tonewerk

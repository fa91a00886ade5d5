// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/SummaryJsonFile.h"

#include <system_error>
#include <utility>

#include "platform/FileSystem.h"
#include "platform/JsonService.h"
#include "platform/LogLine.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr unsigned kDirectoryMode = 0777;

}  // namespace

SummaryJsonFile::SummaryJsonFile(std::string directory, std::string name)
    : directory_(std::move(directory)), name_(std::move(name)) {}

SummaryJsonFile::~SummaryJsonFile() = default;

void SummaryJsonFile::openFile() {
  FileSystem& files = TWReportingContext::current().platform().files;
  if (const std::error_code error = files.createDirectories(directory_, kDirectoryMode)) {
    errorLog(TWReportingSummaryLogCategory(), "can't create logging directory at %@: %@", directory_,
             error.message());
  }
  reportPath_ = directory_ + "/" + name_;
  std::error_code error;
  reportFileHandle_ = files.createFile(directory_, name_, error);
  if (reportFileHandle_ == nullptr) {
    errorLog(TWReportingSummaryLogCategory(),
             "SummaryJsonFileWorker failed to open file. action=open file=%@ error=\"%@\"", reportPath_,
             error.message());
    return;
  }
  infoLog(TWReportingSummaryLogCategory(), "SummaryJsonFileWorker opened file. action=open file=%@",
          reportPath_);
  writeLine("[");
}

void SummaryJsonFile::writeLine(std::string_view text) {
  if (reportFileHandle_ == nullptr) return;
  // Only the line's end is looked at: a disk that refuses the text refuses that too, and is then reported
  // once.
  static_cast<void>(reportFileHandle_->write(text));
  if (const std::error_code error = reportFileHandle_->write("\n")) {
    errorLog(TWReportingSummaryLogCategory(),
             "SummaryJsonFileWorker failed to write line. action=writeline file=%@ error=\"%@\"", reportPath_,
             error.message());
  }
}

void SummaryJsonFile::writeMessage(AudioEventCategory category, AudioEventType type,
                                   const ValueMap& payload) {
  if (reportPath_.empty()) {
    openFile();
  } else {
    writeLine(",");
  }
  std::string member = TWReportingUtilityCategoryString(category) + "_" + TWReportingUtilityTypeString(type);
  const std::size_t count = ++counts_[member];
  member += "_" + std::to_string(count);
  std::string problem;
  const auto text =
      TWReportingContext::current().platform().json.pretty(ValueMap{{member, payload}}, problem);
  if (!text) errorLog(TWReportingSummaryLogCategory(), "dataWithJSONObject: %@", problem);
  writeLine(text.value_or(""));
}

void SummaryJsonFile::closeFile() {
  writeLine("]");
  const std::error_code error = reportFileHandle_ == nullptr ? std::error_code() : reportFileHandle_->close();
  if (error) {
    errorLog(TWReportingSummaryLogCategory(),
             "SummaryJsonFileWorker failed to closed file. action=close file=%@ error=\"%@\"", reportPath_,
             error.message());
  } else {
    infoLog(TWReportingSummaryLogCategory(), "SummaryJsonFileWorker closed file. action=close file=%@",
            reportPath_);
  }
  reportFileHandle_.reset();
  reportPath_.clear();
}

}  // namespace tonewerk

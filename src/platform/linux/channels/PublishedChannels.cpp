// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/PublishedChannels.h"

#include <algorithm>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/files/WholeFile.h"

namespace tonewerk {
namespace {

constexpr std::string_view kEnding = ".json";

bool isChannelFile(const std::string& name) { return name.ends_with(kEnding) && name.front() != '.'; }

ChannelFileProblem problemOf(const std::error_code& error) {
  if (error == std::errc::file_too_large) return {kChannelsTooLarge, "is larger than 1 MiB"};
  if (error == std::errc::resource_unavailable_try_again) {
    return {kChannelsUnsettled, "was written to whenever it was read"};
  }
  if (error == std::errc::invalid_argument) return {kChannelsUnreadable, "is no regular file"};
  return {kChannelsUnreadable, error.message()};
}

ChannelFileProblem limitExceeded(std::size_t bound, const char* what) {
  return {kChannelsTooMany,
          "goes past the " + std::to_string(bound) + " " + what + " that all files together may have"};
}

}  // namespace

void PublishedChannels::read(const ChannelChoice& choice, ChanmeterRecords& records,
                             std::optional<ChanmeterError>& error) {
  const MutexLock lock(mutex_);
  const std::vector<std::string> names = fileNames(error);
  forgetFilesExcept(names);
  Sums sums;
  for (const std::string& name : names) {
    File& file = files_[name];
    // A file that is known to belong to a driver that was not chosen need not be read.
    if (file.driver && !choice.mayInclude(file.driver)) {
      sums.bytes += file.text.size();
      sums.channels += file.records.size();
      continue;
    }
    const std::string path = directory_ + "/" + name;
    const ChannelFileProblem problem = refresh(path, file, sums);
    logProblem(path, problem, file.logged);
    if (problem.code != 0) {
      if (!error && choice.mayInclude(file.driver)) error = ChanmeterError{problem.code};
      continue;
    }
    std::copy_if(file.records.begin(), file.records.end(), std::back_inserter(records),
                 [&choice](const auto& record) { return choice.includes(record->key); });
  }
}

std::vector<std::string> PublishedChannels::fileNames(std::optional<ChanmeterError>& error) {
  std::vector<std::string> names;
  std::size_t entries = 0;
  std::error_code failure;
  std::filesystem::directory_iterator entry(directory_, failure);
  for (const std::filesystem::directory_iterator end; !failure && entry != end && entries < kMaxEntries;
       entry.increment(failure)) {
    ++entries;
    std::string name = entry->path().filename().string();
    if (isChannelFile(name)) names.push_back(std::move(name));
  }
  std::sort(names.begin(), names.end());

  ChannelFileProblem problem;
  if (failure && failure != std::errc::no_such_file_or_directory) problem = problemOf(failure);
  if (entries == kMaxEntries && entry != std::filesystem::directory_iterator()) {
    problem = {kChannelsTooMany, "holds more than " + std::to_string(kMaxEntries) +
                                     " entries, of which the others are left out"};
  }
  if (names.size() > kMaxFiles) {
    problem = {kChannelsTooMany, "holds more than " + std::to_string(kMaxFiles) +
                                     " channel files; left out is all from " + names[kMaxFiles] + " on"};
    names.resize(kMaxFiles);
  }
  logProblem(directory_, problem, loggedDirectoryProblem_);
  if (problem.code != 0) error = ChanmeterError{problem.code};
  return names;
}

void PublishedChannels::forgetFilesExcept(const std::vector<std::string>& names) {
  std::erase_if(files_, [&names](const auto& file) {
    return !std::binary_search(names.begin(), names.end(), file.first);
  });
}

// Returns the file's problem. That may be that a limit is exceeded, which depends on the files before it.
ChannelFileProblem PublishedChannels::refresh(const std::string& path, File& file, Sums& sums) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) {
    const std::error_code error = lastSystemError();
    file.clearContents();
    // The file was removed meanwhile, or is a dangling link.
    return error == std::errc::no_such_file_or_directory ? ChannelFileProblem() : problemOf(error);
  }
  const auto size = static_cast<std::size_t>(status.st_size);
  if (S_ISREG(status.st_mode) && size <= kMaxFileBytes) sums.bytes += size;
  if (sums.bytes > kMaxBytes) {
    file.clearContents();  // it may have been read while there were fewer files before it
    return limitExceeded(kMaxBytes, "bytes");
  }

  if (!file.stamp || FileStamp::of(status) != *file.stamp) readAgain(path, file);
  sums.channels += file.records.size();
  if (sums.channels > kMaxChannels) return limitExceeded(kMaxChannels, "channels");
  return file.problem;
}

void PublishedChannels::File::clearContents() {
  stamp.reset();
  text.clear();
  text.shrink_to_fit();
  records.clear();
}

void PublishedChannels::readAgain(const std::string& path, File& file) {
  std::string text;
  FileStamp stamp{};
  file.stamp.reset();
  if (const std::error_code error = readWholeFile(path, kMaxFileBytes, text, stamp)) {
    file.clearContents();
    file.problem = error == std::errc::no_such_file_or_directory ? ChannelFileProblem() : problemOf(error);
    return;
  }
  if (stamp.isSettled()) file.stamp = stamp;
  if (text == file.text && !text.empty()) return;
  file.text = std::move(text);
  file.problem = {};
  std::optional<ChannelFile> parsed = ChannelFile::parse(file.text, file.problem);
  file.records = parsed ? std::move(parsed->records) : ChanmeterRecords();
  if (parsed) file.driver = std::move(parsed->driver);
}

void PublishedChannels::logProblem(const std::string& path, const ChannelFileProblem& problem,
                                   std::string& logged) const {
  if (problem.text == logged) return;
  logged = problem.text;
  if (problem.code == 0) return;
  errorLog(log_, "%s: %s (failure %lli; the channels concerned are left out)", path, problem.text,
           problem.code);
}

}  // namespace tonewerk

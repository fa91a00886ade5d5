// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/PublishedChannels.h"

#include <algorithm>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>
#include <utility>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
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

// Erases all files but those with these names.
template <typename T>
void eraseExcept(std::map<std::string, T>& files, const std::vector<std::string>& names) {
  std::erase_if(files, [&names](const auto& file) {
    return !std::binary_search(names.begin(), names.end(), file.first);
  });
}

}  // namespace

void PublishedChannels::read(const ChannelChoice& choice, ChanmeterRecords& records,
                             std::optional<ChanmeterError>& error) {
  Reading reading;
  read(choice, reading, nullptr, records, error);
}

void PublishedChannels::read(const ChannelChoice& choice, Reading& reading, Selection* selection,
                             ChanmeterRecords& records, std::optional<ChanmeterError>& error) {
  const MutexLock lock(mutex_);
  if (reading.number_ == 0) begin(reading);
  if (reading.error_) error = reading.error_;
  if (selection != nullptr) eraseExcept(selection->files_, reading.names_);
  Sums sums;
  for (const std::string& name : reading.names_) {
    File& file = files_[name];
    // A file that is known to belong to a driver that was not chosen need not be read.
    if (file.driver && !choice.mayInclude(file.driver)) {
      sums.bytes += file.text.size();
      sums.channels += file.channels();
      continue;
    }
    const std::string path = directory_ + "/" + name;
    const ChannelFileProblem problem = refresh(path, file, reading, sums);
    logProblem(path, problem, file.logged);
    if (problem.code != 0) {
      if (!error && choice.mayInclude(file.driver)) error = ChanmeterError{problem.code};
    } else if (file.parsed && selection != nullptr) {
      append(choice, file, selection->files_[name], records);
    } else if (file.parsed) {
      append(choice, file, records);
    }
  }
}

void PublishedChannels::append(const ChannelChoice& choice, const File& file, ChanmeterRecords& records) {
  std::copy_if(file.parsed->records.begin(), file.parsed->records.end(), std::back_inserter(records),
               [&choice](const auto& record) { return choice.includes(record->key); });
}

void PublishedChannels::append(const ChannelChoice& choice, const File& file, Selection::Places& selected,
                               ChanmeterRecords& records) {
  const ChanmeterRecords& all = file.parsed->records;
  if (selected.layout != file.layout) {
    selected.layout = file.layout;
    selected.places.clear();
    for (std::size_t place = 0; place < all.size(); ++place) {
      if (choice.includes(all[place]->key)) selected.places.push_back(static_cast<std::uint32_t>(place));
    }
  }
  for (const std::uint32_t place : selected.places) records.push_back(all[place]);
}

void PublishedChannels::begin(Reading& reading) {
  reading.number_ = ++lastReading_;
  reading.names_ = fileNames(reading.error_);
  eraseExcept(files_, reading.names_);
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

// Returns the file's problem. That may be that a limit is exceeded, which depends on the files before it.
ChannelFileProblem PublishedChannels::refresh(const std::string& path, File& file, Reading& reading,
                                              Sums& sums) {
  if (std::exchange(file.reading, reading.number_) != reading.number_) lookAt(path, file);
  if (!file.exists) return file.problem;
  sums.bytes += file.bytes;
  if (sums.bytes > kMaxBytes) {
    file.clearContents();  // it may have been read while there were fewer files before it
    return limitExceeded(kMaxBytes, "bytes");
  }

  if (!file.isCurrent) readAgain(path, file, reading.buffer_);
  sums.channels += file.channels();
  if (sums.channels > kMaxChannels) return limitExceeded(kMaxChannels, "channels");
  return file.problem;
}

void PublishedChannels::lookAt(const std::string& path, File& file) const {
  struct stat status {};
  file.exists = stat(path.c_str(), &status) == 0;
  if (!file.exists) {
    const std::error_code error = lastSystemError();
    file.clearContents();
    // The file was removed meanwhile, or is a dangling link.
    file.problem = error == std::errc::no_such_file_or_directory ? ChannelFileProblem() : problemOf(error);
    return;
  }
  const auto size = static_cast<std::size_t>(status.st_size);
  file.bytes = S_ISREG(status.st_mode) && size <= kMaxFileBytes ? size : 0;
  file.isCurrent = file.stamp && FileStamp::of(status) == *file.stamp && !hasRoomNow(file);
}

void PublishedChannels::File::clearContents() {
  isCurrent = false;
  stamp.reset();
  text.clear();
  text.shrink_to_fit();
  parsed.reset();
  refusedBytes = 0;
}

void PublishedChannels::readAgain(const std::string& path, File& file, std::string& buffer) {
  FileStamp stamp{};
  file.stamp.reset();
  const std::error_code error = readWholeFile(path, kMaxFileBytes, buffer, stamp);
  if (error) {
    file.clearContents();
    file.problem = error == std::errc::no_such_file_or_directory ? ChannelFileProblem() : problemOf(error);
  } else {
    // Another owner's records, even the same ones, are for another account.
    if (std::exchange(file.owner, stamp.owner) != stamp.owner) file.clearContents();
    if (stamp.isSettled()) file.stamp = stamp;
    if (buffer != file.text || buffer.empty()) {
      std::swap(buffer, file.text);
      if (!file.parsed || !file.parsed->update(buffer, file.text)) parseText(file);
      charge(file);
    }
  }
  file.isCurrent = true;
}

void PublishedChannels::parseText(File& file) {
  file.problem = {};
  file.parsed = ChannelFile::parse(file.text, file.problem);
  if (!file.parsed) return;
  file.driver = file.parsed->driver;
  file.layout = ++lastLayout_;
}

// The records before these no longer count, unless a sample holds them.
void PublishedChannels::charge(File& file) const {
  if (accounts_ == nullptr || !file.parsed) return;
  const std::uint64_t bytes = file.parsed->recordBytes();
  std::optional<Charge> charge =
      Charge::withinShare(accounts_->of(file.owner), Resource::kSnapshotBytes, bytes);
  if (charge) return file.parsed->keep(std::move(*charge));
  const std::optional<FileStamp> stamp = file.stamp;
  file.clearContents();
  file.stamp = stamp;
  file.refusedBytes = bytes;
  // The same text as long as there is no room, so that it is logged once.
  file.problem = {kChannelsTooMany,
                  "holds more than is left of the share of user " + std::to_string(file.owner)};
}

bool PublishedChannels::hasRoomNow(const File& file) const {
  return file.refusedBytes != 0 &&
         Charge::withinShare(accounts_->of(file.owner), Resource::kSnapshotBytes, file.refusedBytes);
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

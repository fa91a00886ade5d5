// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/JournalReader.h"

#include <utility>

#include "platform/linux/journal/SegmentFormat.h"
#include "platform/linux/journal/SegmentNames.h"

namespace tonewerk {

std::error_code JournalReader::read(Visit visit) {
  std::vector<Segment> segments;
  if (const std::error_code error = list(segments)) return error;
  bool isGap = true;  // the segment before was not read
  for (const Segment& segment : segments) {
    if (!load(segment)) {
      isGap = true;
      continue;
    }
    if (std::exchange(isGap, false)) last_ = segment.first - 1;
    if (!readSegment(segment.first, &segment == &segments.back(), visit)) break;
  }
  return {};
}

std::error_code JournalReader::list(std::vector<Segment>& segments) const {
  std::vector<JournalDirectory::Entry> entries;
  if (const std::error_code error = directory_.list(entries)) return error;
  std::map<std::uint64_t, std::string> names;
  for (JournalDirectory::Entry& entry : entries) {
    std::optional<std::uint64_t> first = segmentNumberOf(entry.name);
    if (!first) first = segmentNumberOf(entry.name, kOldSegmentEnding);
    if (first) names.emplace(*first, std::move(entry.name));
  }
  for (auto& [first, name] : names) segments.push_back({first, std::move(name)});
  return {};
}

bool JournalReader::load(const Segment& segment) {
  std::error_code error = directory_.read(segment.name, kMaxSegmentBytes, bytes_);
  if (error == std::errc::no_such_file_or_directory) {
    error = directory_.read(oldSegmentNameOf(segment.name), kMaxSegmentBytes, bytes_);
    if (error == std::errc::no_such_file_or_directory) return false;
  }
  const std::optional<SegmentHead> head = readSegmentHead(bytes_);
  if (!error && (!head || head->version <= kSegmentVersion)) return true;
  unread_.push_back(segment.name + ": " +
                    (error ? error.message() : "a newer version of the program has written it"));
  return false;
}

bool JournalReader::readSegment(std::uint64_t first, bool isNewest, Visit visit) {
  SegmentScan scan(bytes_, first - 1);
  bool goesOn = true;
  std::uint64_t damagedPlaces = 0;
  while (goesOn) {
    const std::optional<Journal::Record> record = scan.next();
    if (!record) break;
    const bool isOtherProcess = scan.marker() != marker_;
    if (std::exchange(damagedPlaces, scan.damagedPlaces()) != scan.damagedPlaces()) isDamaged_ = true;
    // A process may leave out numbers when it begins.
    const bool isWithin = reading_.records == 0 || !isOtherProcess || isDamaged_;
    if (isWithin && record->sequence > last_) missing_ += record->sequence - last_ - 1;
    isDamaged_ = false;
    last_ = record->sequence;
    marker_ = scan.marker();
    const bool isFirstOfProcess = isOtherProcess && reading_.records > 0;
    ++reading_.records;
    goesOn = visit(*record, isFirstOfProcess);
  }
  reading_.damagedPlaces += scan.damagedPlaces();
  reading_.damagedBytes += scan.damagedBytes();
  const std::uint64_t rest = bytes_.size() - scan.end();
  if (!goesOn || rest == 0) return goesOn;
  // The newest one ends in a part of a record after a crash, or while the daemon writes.
  if (isNewest) {
    reading_.tornBytes += rest;
  } else {
    ++reading_.damagedPlaces;
    reading_.damagedBytes += rest;
    isDamaged_ = true;
  }
  return true;
}

}  // namespace tonewerk

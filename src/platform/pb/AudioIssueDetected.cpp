// SPDX-License-Identifier: Apache-2.0
#include "platform/pb/AudioIssueDetected.h"

#include "platform/pb/Reader.h"
#include "platform/pb/TextFormatter.h"
#include "platform/pb/Writer.h"

namespace tonewerk::diagwiremetrics {
namespace {

enum Tag : std::uint32_t { kTimestamp = 1, kDuration = 2, kIssuetype = 3, kNode = 4, kRtaidclient = 5 };

// Returns the byte string that holds the field with this tag; null when the field is not a byte string.
std::string* bytesOf(AudioIssueDetected& record, std::uint32_t tag) {
  switch (tag) {
    case kIssuetype:
      return &record.issuetype;
    case kNode:
      return &record.node;
    case kRtaidclient:
      return &record.rtaidclient;
    default:
      return nullptr;
  }
}

// Skips a field that has another wire type than expected, like an unknown field. Returns false on an error.
bool readField(AudioIssueDetected& record, PB::Reader& reader, const PB::Reader::Key& key) {
  const bool isNumber = key.tag == kTimestamp || key.tag == kDuration;
  if (isNumber && key.type == PB::WireType::kVarint) {
    const auto value = reader.readVarint();
    if (!value) return false;
    if (key.tag == kTimestamp) record.timestamp = *value;
    if (key.tag == kDuration) record.duration = static_cast<std::uint32_t>(*value);
    return true;
  }
  std::string* bytes = bytesOf(record, key.tag);
  if (bytes == nullptr || key.type != PB::WireType::kLengthDelimited) return reader.skip(key);
  auto value = reader.readBytes();
  if (!value) return false;
  *bytes = std::move(*value);
  return true;
}

}  // namespace

bool AudioIssueDetected::readFrom(PB::Reader& reader) {
  while (const auto key = reader.nextKey()) {
    if (key->type == PB::WireType::kEndGroup) return true;
    if (!readField(*this, reader, *key)) return false;
  }
  return !reader.hasError();
}

void AudioIssueDetected::writeTo(PB::Writer& writer) const {
  if (timestamp) writer.writeVarint(kTimestamp, *timestamp);
  writer.writeVarint(kDuration, duration);
  writer.writeBytes(kIssuetype, issuetype);
  writer.writeBytes(kNode, node);
  writer.writeBytes(kRtaidclient, rtaidclient);
}

void AudioIssueDetected::formatText(PB::TextFormatter& formatter, std::string_view name) const {
  formatter.beginObject(name);
  formatter.format("duration", duration);
  formatter.format("issuetype", issuetype);
  formatter.format("node", node);
  formatter.format("rtaidclient", rtaidclient);
  if (timestamp) formatter.format("timestamp", *timestamp);
  formatter.endObject();
}

std::size_t AudioIssueDetected::hash() const {
  std::size_t result = 0;
  const auto add = [&result](std::size_t part) { result = result * 1'000'003 + part; };
  add(timestamp ? std::hash<std::uint64_t>()(*timestamp) + 1 : 0);
  add(duration);
  for (const std::string* bytes : {&issuetype, &node, &rtaidclient}) add(std::hash<std::string>()(*bytes));
  return result;
}

}  // namespace tonewerk::diagwiremetrics

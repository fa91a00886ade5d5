// SPDX-License-Identifier: Apache-2.0
#include "support/recordings/StoreText.h"

#include <cstdint>
#include <map>
#include <optional>
#include <sstream>
#include <utility>

#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/json/ValueMapFormatter.h"
#include "platform/linux/protobuf/ProtozeroReader.h"
#include "platform/linux/store/StoreReader.h"
#include "platform/linux/store/StoreSchema.h"
#include "platform/pb/AudioIssueDetected.h"
#include "values/Date.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

using diagwiremetrics::AudioIssueDetected;

class StoreWriter {
 public:
  explicit StoreWriter(StoreReader& reader) : reader_(reader) {}

  std::string write() {
    const bool isRead = writeEvents() && writeMetrics() && writePower() && writeRtc();
    return isRead ? out_.str() : "cannot be read: " + reader_.problem() + "\n";
  }

 private:
  bool writeEvents() {
    std::int64_t row = -1;
    std::string payload;
    const bool isRead = reader_.readEvents({}, [&](const StoredEvent& event) {
      if (event.id / kStoreNamesPerRow == row) {
        out_ << "  also " << event.name << '\n';
        return;
      }
      writePayload(payload);
      row = event.id / kStoreNamesPerRow;
      payload = event.payload;
      payloads_[row] = mapOf(payload);
      out_ << "event " << textOf(Date{event.recordedAt}) << ' ' << event.name << '\n';
    });
    writePayload(payload);
    return isRead;
  }

  bool writeMetrics() {
    return reader_.readMetrics({}, [&](const StoredMetric& metric) {
      out_ << "metric " << textOf(Date{metric.postedAt}) << ' ' << metric.identifier << '\n';
      AudioIssueDetected record;
      ProtozeroReader bytes(metric.record);
      if (metric.identifier != AudioIssueDetected::kMetricIdentifier || !record.readFrom(bytes)) {
        out_ << "  not understood\n";
        return;
      }
      ValueMapFormatter formatter;
      record.formatText(formatter, "record");
      writeMap(*formatter.map().find("record")->asMap());
    });
  }

  bool writePower() {
    return reader_.readPowerEvents({}, [&](const StoredPowerEvent& event) {
      out_ << "power " << textOf(Date{event.recordedAt}) << " group " << event.group << ' ' << event.name
           << '\n';
      writePayload(event.payload);
    });
  }

  bool writeRtc() {
    std::map<std::int64_t, std::size_t> numbers;
    const bool hasSessions = reader_.readRtcSessions({}, [&](const StoredRtcSession& session) {
      const std::size_t number = numbers.emplace(session.id, numbers.size() + 1).first->second;
      out_ << "rtc session " << number << ' ' << textOf(Date{session.startedAt}) << '\n';
      writePayload(session.sessionInfo);
      writePayload(session.userInfo);
    });
    return hasSessions && reader_.readRtcMessages({}, [&](const StoredRtcMessage& message) {
      out_ << "rtc message " << textOf(Date{message.sentAt}) << " session " << numbers[message.session]
           << " category " << message.category << " type " << message.type << '\n';
      const auto event = payloads_.find(message.id);
      const ValueMap payload = mapOf(message.payload);
      if (event == payloads_.end() || !writeDifference(event->second, payload)) writeMap(payload);
    });
  }

  // A message is mostly the event with the same identifier, without a key.
  bool writeDifference(ValueMap event, const ValueMap& message) {
    std::string without;
    for (const ValueMap::Entry& entry : ValueMap(event)) {
      if (message.contains(entry.key)) continue;
      without += " without " + entry.key.string();
      event.erase(entry.key);
    }
    if (json_.compact(event) != json_.compact(message)) return false;
    out_ << "  as the event" << without << '\n';
    return true;
  }

  ValueMap mapOf(const std::string& json) const {
    std::string problem;
    const std::optional<Value> value = json_.parse(json, problem);
    return value && value->asMap() != nullptr ? *value->asMap() : ValueMap{{"not JSON", json}};
  }

  void writePayload(const std::string& payload) {
    if (!payload.empty()) writeMap(mapOf(payload));
  }

  void writeMap(const ValueMap& map) {
    for (const ValueMap::Entry& entry : map) {
      const std::string object = json_.compact(ValueMap{{entry.key, entry.value}});
      out_ << "  " << object.substr(1, object.size() - 2) << '\n';
    }
  }

  StoreReader& reader_;
  const NlohmannJsonService json_;
  std::ostringstream out_;
  std::map<std::int64_t, ValueMap> payloads_;  // of the events, by the identifier of their row
};

}  // namespace

std::string storeText(const std::string& directory) {
  StoreReader reader;
  switch (reader.open(directory)) {
    case StoreReader::Outcome::kDone:
      return StoreWriter(reader).write();
    case StoreReader::Outcome::kNoStore:
      return {};
    case StoreReader::Outcome::kFailed:
      break;
  }
  return "cannot be opened: " + reader.problem() + "\n";
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/RecordingWriter.h"

#include <algorithm>
#include <ostream>
#include <utility>

#include "platform/JsonService.h"
#include "tools/recording/RecordedProperties.h"
#include "tools/recording/RecordedValues.h"

namespace tonewerk {
namespace {

// The JSON of a value, which no service writes alone.
std::string jsonOf(const Value& value, const JsonService& json) {
  static const std::string kKey = "v";
  const std::string object = json.compact(ValueMap{{kKey, value}});
  const std::size_t begin = kKey.size() + 4;  // {"v":
  return object.substr(begin, object.size() - begin - 1);
}

std::string jsonOf(const Arguments& arguments, const JsonService& json) {
  std::string text = "[";
  for (const Argument& argument : arguments) {
    if (text.size() > 1) text += ',';
    text += argument ? jsonOf(recordedValue(*argument), json) : "null";
  }
  return text + "]";
}

}  // namespace

RecordingWriter::RecordingWriter(std::ostream& out, const JsonService& json, ValueMap device)
    : out_(out), json_(json), device_(std::move(device)) {}

void RecordingWriter::call(double time, const RecordedClient& client, const std::string& method,
                           const Arguments& arguments) {
  const double at = placeOf(time);
  if (connected_.insert(client.number).second) connect(at, client);
  write({{"at", at}, {"client", client.number}, {"call", method}}, jsonOf(arguments, json_));
}

void RecordingWriter::disconnect(double time, std::int64_t client) {
  if (connected_.erase(client) == 0) return;
  write({{"at", placeOf(time)}, {"client", client}, {"disconnect", true}});
}

void RecordingWriter::restart(double time) {
  connected_.clear();
  if (startsAt_) write({{"at", placeOf(time)}, {"restart", true}});
}

void RecordingWriter::reach(double time) {
  if (startsAt_ && time - *startsAt_ > last_) write({{"at", placeOf(time)}, {"device", ValueMap()}});
}

bool RecordingWriter::finish() { return static_cast<bool>(out_.flush()); }

// The difference of two times of the same years is exact, so a replay that adds it finds the same time again.
double RecordingWriter::placeOf(double time) {
  if (!startsAt_) {
    startsAt_ = time;
    ValueMap device = device_;
    device.set(recorded::kStartsAt, time);
    write({{"device", device}});
  }
  last_ = std::max(last_, time - *startsAt_);
  return last_;
}

void RecordingWriter::connect(double at, const RecordedClient& client) {
  ValueMap properties;
  if (client.user != kNoUser) properties.set(recorded::kUser, static_cast<std::int64_t>(client.user));
  if (!client.process.empty()) properties.set(recorded::kProcess, client.process);
  write({{"at", at}, {"client", client.number}, {"connect", properties}});
}

void RecordingWriter::write(const ValueMap& line, const std::string& parameters) {
  std::string text = json_.compact(line);
  if (!parameters.empty()) text.insert(text.size() - 1, ",\"params\":" + parameters);
  out_ << text << '\n';
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/Recording.h"

#include <istream>
#include <utility>

#include "platform/JsonService.h"
#include "tools/recording/JsonArguments.h"
#include "tools/recording/RecordedProperties.h"
#include "tools/recording/RecordedValues.h"

namespace tonewerk {
namespace {

using Kind = RecordedStep::Kind;

constexpr std::string_view kAt = "at";
constexpr std::string_view kClient = "client";
constexpr std::string_view kCall = "call";
constexpr std::string_view kConnect = "connect";
constexpr std::string_view kDisconnect = "disconnect";
constexpr std::string_view kDevice = "device";
constexpr std::string_view kRestart = "restart";
constexpr std::string_view kParameters = "params";

// Thirty years. A clock's nanoseconds hold nearly ten times as much.
constexpr double kMaxAt = 1e9;

bool isNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr;
}

// The functions below return the problem, or an empty text.

std::string takeCall(const Value& call, RecordedStep& step) {
  if (call.asString() == nullptr) return "\"call\" must be the name of a request";
  step.method = call.text();
  return {};
}

std::string takeTrue(std::string_view name, const Value& value, Kind kind, RecordedStep& step) {
  step.kind = kind;
  if (value.asBoolean() == nullptr || !*value.asBoolean())
    return "\"" + std::string(name) + "\" must be true";
  return {};
}

std::string takeProperties(std::string_view name, const Value& properties, Kind kind, RecordedStep& step) {
  step.kind = kind;
  if (properties.asMap() == nullptr) return "\"" + std::string(name) + "\" must be an object";
  step.properties = *properties.asMap();
  return {};
}

// Reads what the line is about.
std::string takeKind(const ValueMap& members, RecordedStep& step, std::size_t& kinds) {
  std::string problem;
  const auto take = [&](std::string_view name, auto read) {
    const Value* member = members.find(name);
    if (member == nullptr) return;
    ++kinds;
    if (problem.empty()) problem = read(*member);
  };
  take(kCall, [&](const Value& member) { return takeCall(member, step); });
  take(kConnect, [&](const Value& member) { return takeProperties(kConnect, member, Kind::kConnect, step); });
  take(kDisconnect,
       [&](const Value& member) { return takeTrue(kDisconnect, member, Kind::kDisconnect, step); });
  take(kDevice, [&](const Value& member) { return takeProperties(kDevice, member, Kind::kDevice, step); });
  take(kRestart, [&](const Value& member) { return takeTrue(kRestart, member, Kind::kRestart, step); });
  return problem;
}

bool isMember(std::string_view name) {
  return name == kAt || name == kClient || name == kCall || name == kConnect || name == kDisconnect ||
         name == kDevice || name == kRestart;
}

// Reads the line's members besides "params".
std::string takeMembers(const ValueMap& members, RecordedStep& step) {
  for (const ValueMap::Entry& entry : members) {
    if (!isMember(entry.key)) return "unknown member \"" + entry.key.string() + "\"";
  }
  std::size_t kinds = 0;
  std::string problem = takeKind(members, step, kinds);
  if (kinds == 0) return "\"call\" must be the name of a request";
  if (kinds > 1)
    return "only one of \"call\", \"connect\", \"disconnect\", \"device\" and \"restart\" is possible";
  if (!problem.empty()) return problem;
  const Value* client = members.find(kClient);
  if (client != nullptr && step.kind == Kind::kDevice) return "a device has no \"client\"";
  if (client != nullptr && step.kind == Kind::kRestart) return "a restart has no \"client\"";
  const Value* at = members.find(kAt);
  if (at == nullptr && step.kind == Kind::kDevice) return {};  // at the time of the line before
  if (at == nullptr || !isNumber(*at) || !(at->number() >= 0 && at->number() <= kMaxAt))
    return "\"at\" must be a number of seconds from 0 to 1000000000";
  step.at = at->number();
  if (client == nullptr) return {};
  if (client->asInteger() == nullptr || *client->asInteger() < 0)
    return "\"client\" must be an integer from 0";
  step.client = *client->asInteger();
  return {};
}

// The time at which the recording begins, if its first line says it and that is a number.
double startOf(const RecordedStep& first) {
  const Value* startsAt = first.properties.find(recorded::kStartsAt);
  return startsAt != nullptr && isNumber(*startsAt) ? startsAt->number() : 0.0;
}

std::string checkRequest(const RecordedStep& call, const RequestSet& interface) {
  const auto method = interface.find(call.method);
  if (!method) return "there is no request \"" + call.method + "\"";
  // The time does not matter here: {"now": offset} always becomes a number.
  return problemWith(interface.methods[*method], call.parametersAt(0.0)).value_or("");
}

}  // namespace

Arguments RecordedStep::parametersAt(double now) const {
  Arguments resolved;
  resolved.reserve(parameters.size());
  for (const Argument& parameter : parameters) {
    resolved.push_back(parameter ? Argument(playedValue(*parameter, now)) : Argument());
  }
  return resolved;
}

std::optional<Recording> Recording::read(std::istream& text, const RequestSet& interface,
                                         const JsonService& json, std::string& problem) {
  Recording recording;
  std::string line;
  for (std::size_t number = 1; std::getline(text, line); ++number) {
    if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
    RecordedStep step;
    step.line = number;
    step.at = recording.steps_.empty() ? 0.0 : recording.steps_.back().at;
    ValueMap members;
    bool hasParameters = false;
    std::string wrong = parseJsonCall(line, kParameters, json, members, step.parameters, hasParameters);
    if (wrong.empty()) wrong = takeMembers(members, step);
    if (wrong.empty() && hasParameters != (step.kind == Kind::kCall)) {
      wrong = hasParameters ? "only a call has \"params\"" : "\"params\" must be an array";
    }
    if (wrong.empty()) wrong = recording.add(std::move(step), interface);
    if (!wrong.empty()) {
      problem = "line " + std::to_string(number) + ": " + wrong;
      return std::nullopt;
    }
  }
  return recording;
}

// A client that calls without having connected connects with the call.
std::string Recording::add(RecordedStep step, const RequestSet& interface) {
  const double last = steps_.empty() ? 0.0 : steps_.back().at;
  if (step.at < last) return "\"at\" goes back, from " + textOf(last) + " to " + textOf(step.at);
  if (step.kind == Kind::kRestart) isConnected_.clear();
  if (steps_.empty()) startsAt_ = startOf(step);
  if (startsAt_ + step.at > kMaxRecordedTime) return "\"at\" is after the year 9999";
  bool& isConnected = isConnected_[step.client];
  std::string problem;
  switch (step.kind) {
    case Kind::kCall:
      problem = checkRequest(step, interface);
      isConnected = true;
      ++requests_;
      break;
    case Kind::kConnect:
      if (isConnected) return "client " + std::to_string(step.client) + " is connected already";
      problem = problemWithClient(step.properties);
      isConnected = true;
      break;
    case Kind::kDisconnect:
      if (!isConnected) return "client " + std::to_string(step.client) + " is not connected";
      isConnected = false;
      break;
    case Kind::kDevice:
      problem = problemWithDevice(step.properties, steps_.empty());
      break;
    case Kind::kRestart:
      break;
  }
  steps_.push_back(std::move(step));
  return problem;
}

}  // namespace tonewerk

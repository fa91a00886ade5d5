// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/Recording.h"

#include <istream>
#include <utility>

#include "platform/JsonService.h"
#include "tools/recording/JsonArguments.h"

namespace tonewerk {
namespace {

constexpr std::string_view kAt = "at";
constexpr std::string_view kCall = "call";
constexpr std::string_view kParameters = "params";
constexpr std::string_view kNow = "now";

bool isNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr;
}

// The offset of {"now": offset}; none for any other map.
std::optional<double> offsetFromNow(const ValueMap& map) {
  const Value* offset = map.find(kNow);
  if (map.size() != 1 || offset == nullptr || !isNumber(*offset)) return std::nullopt;
  return offset->number();
}

Value valueAt(const Value& value, double now) {
  if (const ValueArray* array = value.asArray()) {
    ValueArray resolved;
    for (const Value& element : *array) resolved.append(valueAt(element, now));
    return resolved;
  }
  const ValueMap* map = value.asMap();
  if (map == nullptr) return value;
  if (const auto offset = offsetFromNow(*map)) return now + *offset;
  ValueMap resolved;
  for (const ValueMap::Entry& entry : *map) resolved.set(entry.key, valueAt(entry.value, now));
  return resolved;
}

// Reads the line's members besides "params". Returns the problem, or an empty text.
std::string takeMembers(const ValueMap& members, RecordedCall& call) {
  for (const ValueMap::Entry& entry : members) {
    if (entry.key != kAt && entry.key != kCall) return "unknown member \"" + entry.key.string() + "\"";
  }
  const Value* at = members.find(kAt);
  if (at == nullptr || !isNumber(*at) || at->number() < 0) return "\"at\" must be a number of seconds from 0";
  call.at = at->number();
  const Value* method = members.find(kCall);
  if (method == nullptr || method->asString() == nullptr) return "\"call\" must be the name of a request";
  call.method = method->text();
  return {};
}

std::string checkRequest(const RecordedCall& call, const RequestSet& interface) {
  const auto method = interface.find(call.method);
  if (!method) return "there is no request \"" + call.method + "\"";
  // The time does not matter here: {"now": offset} always becomes a number.
  return problemWith(interface.methods[*method], call.parametersAt(0.0)).value_or("");
}

}  // namespace

Arguments RecordedCall::parametersAt(double now) const {
  Arguments resolved;
  resolved.reserve(parameters.size());
  for (const Argument& parameter : parameters) {
    resolved.push_back(parameter ? Argument(valueAt(*parameter, now)) : Argument());
  }
  return resolved;
}

std::optional<Recording> Recording::read(std::istream& text, const RequestSet& interface,
                                         const JsonService& json, std::string& problem) {
  Recording recording;
  std::string line;
  for (std::size_t number = 1; std::getline(text, line); ++number) {
    if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
    RecordedCall call;
    call.line = number;
    ValueMap members;
    std::string wrong = parseJsonCall(line, kParameters, json, members, call.parameters);
    if (wrong.empty()) wrong = takeMembers(members, call);
    if (wrong.empty()) wrong = checkRequest(call, interface);
    const double last = recording.calls_.empty() ? 0.0 : recording.calls_.back().at;
    if (wrong.empty() && call.at < last)
      wrong = "\"at\" goes back, from " + textOf(last) + " to " + textOf(call.at);
    if (!wrong.empty()) {
      problem = "line " + std::to_string(number) + ": " + wrong;
      return std::nullopt;
    }
    recording.calls_.push_back(std::move(call));
  }
  return recording;
}

}  // namespace tonewerk

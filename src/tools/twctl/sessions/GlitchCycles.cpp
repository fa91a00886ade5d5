// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/GlitchCycles.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "platform/JsonService.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// A time that is there and can be one.
std::optional<double> timeIn(const ValueMap& map, std::string_view key) {
  const Value* value = map.find(key);
  if (value == nullptr) return std::nullopt;
  const bool isNumber =
      value->asDouble() != nullptr || value->asInteger() != nullptr || value->asUnsigned() != nullptr;
  if (!isNumber || !(std::abs(value->number()) <= GlitchCycles::kMostMicroseconds)) return std::nullopt;
  return value->number();
}

std::string textIn(const ValueMap& map, std::string_view key) {
  const Value* value = map.find(key);
  if (value == nullptr || value->asString() == nullptr) return {};
  std::string text = value->text();
  std::size_t end = std::min(text.size(), GlitchCycles::kMostCharacters);
  while (end > 0 && end < text.size() && isUtf8Continuation(text[end])) --end;
  text.resize(end);
  return text;
}

const ValueArray* arrayIn(const ValueMap& map, std::string_view key) {
  const Value* value = map.find(key);
  return value == nullptr ? nullptr : value->asArray();
}

std::optional<GlitchCycle::Node> nodeOf(const Value& value) {
  const ValueMap* map = value.asMap();
  if (map == nullptr) return std::nullopt;
  GlitchCycle::Node node{.name = textIn(*map, "name"),
                         .process = textIn(*map, "process"),
                         .signal = std::max(0.0, timeIn(*map, "signal").value_or(0.0)),
                         .awake = timeIn(*map, "awake"),
                         .finish = timeIn(*map, "finish")};
  if (node.name.empty()) return std::nullopt;
  // A clock that is read on another processor may be a little behind.
  if (node.awake) node.awake = std::max(*node.awake, node.signal);
  if (node.finish) node.finish = std::max(*node.finish, node.awake.value_or(node.signal));
  return node;
}

std::optional<GlitchCycle> cycleOf(const Value& value) {
  const ValueMap* map = value.asMap();
  const ValueArray* nodes = map == nullptr ? nullptr : arrayIn(*map, "nodes");
  if (nodes == nullptr) return std::nullopt;
  const std::optional<double> begin = timeIn(*map, "begin");
  const std::optional<double> period = timeIn(*map, "period");
  if (!begin || !period || *period <= 0.0) return std::nullopt;
  GlitchCycle cycle{.begin = *begin, .period = *period, .nodes = {}};
  for (const Value& one : *nodes) {
    if (cycle.nodes.size() == GlitchCycles::kMostNodes) break;
    if (std::optional<GlitchCycle::Node> node = nodeOf(one)) cycle.nodes.push_back(*std::move(node));
  }
  return cycle;
}

}  // namespace

std::vector<GlitchCycle> GlitchCycles::read(std::string_view text, const JsonService& json) {
  std::vector<GlitchCycle> cycles;
  std::string problem;
  const std::optional<Value> value = json.parse(text, problem);
  const ValueArray* all = value ? value->asArray() : nullptr;
  if (all == nullptr) return cycles;
  for (const Value& one : *all) {
    if (cycles.size() == kMostCycles) break;
    if (std::optional<GlitchCycle> cycle = cycleOf(one)) cycles.push_back(*std::move(cycle));
  }
  std::stable_sort(cycles.begin(), cycles.end(),
                   [](const GlitchCycle& a, const GlitchCycle& b) { return a.begin < b.begin; });
  return cycles;
}

}  // namespace tonewerk

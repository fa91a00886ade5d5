// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/GlitchCyclesText.h"

#include <algorithm>
#include <cstdio>
#include <deque>

namespace tonewerk {

namespace {

using std::chrono::nanoseconds;

// The names are valid UTF-8 without control characters.
std::string quoted(const std::string& text) {
  std::string result = "\"";
  for (const char c : text) {
    if (c == '"' || c == '\\') result += '\\';
    result += c;
  }
  return result + '"';
}

std::string microseconds(nanoseconds time) {
  char text[32];
  std::snprintf(text, sizeof text, "%.1f", static_cast<double>(time.count()) / 1e3);
  return text;
}

void addTime(std::string& text, const char* key, std::int32_t time, nanoseconds cycle) {
  if (time == KeptNode::kNever) return;
  text += std::string(",\"") + key + "\":" + microseconds(cycle + nanoseconds(time));
}

}  // namespace

std::string glitchCyclesText(const GlitchEvidence& evidence,
                             const std::function<std::string(std::uint32_t node)>& processOf) {
  if (evidence.first >= evidence.cycles.size()) return "[]";
  const nanoseconds origin = evidence.cycles[evidence.first].cycle.begin;
  std::map<std::uint32_t, std::string> heads;  // what all entries of a node begin with
  const auto headOf = [&](std::uint32_t node) -> const std::string& {
    const auto [head, isNew] = heads.try_emplace(node);
    if (!isNew) return head->second;
    const auto name = evidence.names.find(node);
    head->second = "{\"name\":" + quoted(name == evidence.names.end() ? std::string() : name->second);
    if (const std::string process = processOf(node); !process.empty()) {
      head->second += ",\"process\":" + quoted(process);
    }
    return head->second;
  };
  const auto textOf = [&](const GlitchCycle& cycle) {
    const nanoseconds begin = cycle.cycle.begin - origin;
    std::string text = "{\"begin\":" + microseconds(begin) +
                       ",\"period\":" + microseconds(cycle.cycle.period) + ",\"nodes\":[";
    std::vector<const KeptNode*> nodes;
    for (const KeptNode& node : cycle.nodes) nodes.push_back(&node);
    // Those without a signal come last.
    std::stable_sort(nodes.begin(), nodes.end(), [](const KeptNode* a, const KeptNode* b) {
      return static_cast<std::uint32_t>(a->signal) < static_cast<std::uint32_t>(b->signal);
    });
    for (const KeptNode* node : nodes) {
      std::string entry = headOf(node->node);
      addTime(entry, "signal", node->signal, begin);
      addTime(entry, "awake", node->awake, begin);
      addTime(entry, "finish", node->finish, begin);
      if (text.size() + entry.size() + 5 > kMaxCyclesBytes) break;
      text += (text.back() == '[' ? "" : ",") + entry + "}";
    }
    return text + "]}";
  };

  std::deque<std::string> texts{textOf(evidence.cycles[evidence.first])};
  std::size_t size = texts.front().size() + 2;
  const auto fits = [&](const std::string& text) {
    if (size + text.size() + 1 > kMaxCyclesBytes) return false;
    size += text.size() + 1;
    return true;
  };
  std::size_t before = evidence.first;
  std::size_t after = evidence.first + 1;
  bool isFull = false;
  while (!isFull && (before > 0 || after < evidence.cycles.size())) {
    for (const bool isLater : {true, false}) {
      if (isFull || (isLater ? after >= evidence.cycles.size() : before == 0)) continue;
      std::string text = textOf(evidence.cycles[isLater ? after : before - 1]);
      if (!fits(text)) {
        isFull = true;
      } else if (isLater) {
        texts.push_back(std::move(text));
        ++after;
      } else {
        texts.push_front(std::move(text));
        --before;
      }
    }
  }
  std::string joined;
  for (const std::string& text : texts) joined += (joined.empty() ? "[" : ",") + text;
  return joined + "]";
}

}  // namespace tonewerk

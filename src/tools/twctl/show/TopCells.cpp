// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TopCells.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <optional>
#include <utility>

#include "protocol/WatchKeys.h"
#include "tools/twctl/show/TopFrame.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr double kUnknown = -1.0;  // sorted below all that is known

std::string withDecimal(double number) {
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%.1f", number);
  return text.data();
}

std::string percent(double share) {
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%.0f %%", share * 100);
  return text.data();
}

std::string counted(std::int64_t count, const char* one, const char* many) {
  return std::to_string(count) + " " + (count == 1 ? one : many);
}

std::string clientOf(const ValueMap& session) {
  std::string text = session.text(kWatchKeyProcessName);
  if (text.empty()) text = session.boolean(kWatchKeySingleMessageSession) ? "(the daemon)" : "?";
  return text + " " + session.text(kWatchKeyProcessIdentifier);
}

TopCell textCell(std::string text) { return {printable(std::move(text))}; }

TopCell numberCell(const std::optional<double>& number, std::string (*format)(double)) {
  return number ? TopCell{format(*number), *number} : TopCell{"-", kUnknown};
}

TopCell countCell(const Value* count) {
  return count == nullptr ? TopCell{"-", kUnknown}
                          : TopCell{std::to_string(count->integer()), static_cast<double>(count->integer())};
}

TopCell countCell(const std::optional<std::int64_t>& count) {
  return count ? TopCell{std::to_string(*count), static_cast<double>(*count)} : TopCell{"-", kUnknown};
}

}  // namespace

TopCells sessionCells(const std::vector<SessionRow>& rows) {
  TopCells cells{{{"session", true, 4},
                  {"service", false, 3},
                  {"application", false, 0},
                  {"client", false, 5},
                  {"msg/s", true, 1},
                  {"redundant", true, 7},
                  {"overloads", true, 2},
                  {"running", true, 6}},
                 {}};
  for (const SessionRow& row : rows) {
    const ValueMap& session = row.session;
    const std::int64_t identifier = session.integer(kWatchKeyReporterID);
    const Value* seconds = session.find(kWatchKeySeconds);
    std::vector<TopCell> line;
    line.push_back({std::to_string(identifier), static_cast<double>(identifier)});
    line.push_back(textCell(session.text(kWatchKeyServiceName)));
    line.push_back(textCell(session.text(kWatchKeyApplication)));
    line.push_back(textCell(clientOf(session)));
    line.push_back(numberCell(row.messagesPerSecond, withDecimal));
    line.push_back(row.redundantShare
                       ? TopCell{withDecimal(*row.redundantShare * 100) + " %", *row.redundantShare}
                       : TopCell{"-", kUnknown});
    line.push_back(countCell(session.find(kWatchKeyOverloads)));
    line.push_back(seconds == nullptr ? TopCell{"-", kUnknown}
                                      : TopCell{runningTime(seconds->number()), seconds->number()});
    cells.rows.push_back(std::move(line));
  }
  return cells;
}

TopCells nodeCells(const std::vector<NodeHealth>& nodes) {
  TopCells cells{{{"node", false, 0},
                  {"of the period", true, 1},
                  {"worst", true, 2},
                  {"glitches", true, 3},
                  {"process", true, 4}},
                 {}};
  for (const NodeHealth& node : nodes) {
    cells.rows.push_back({textCell(node.node), numberCell(node.busy, percent),
                          numberCell(node.worst, percent), countCell(node.glitches),
                          countCell(node.process)});
  }
  return cells;
}

std::string topSummary(const std::vector<SessionRow>& rows) {
  double sum = 0;
  bool isKnown = false;
  std::optional<std::int64_t> overloads;
  for (const SessionRow& row : rows) {
    sum += row.messagesPerSecond.value_or(0);
    isKnown = isKnown || row.messagesPerSecond;
    if (const Value* count = row.session.find(kWatchKeyOverloads))
      overloads = overloads.value_or(0) + count->integer();
  }
  std::string text = counted(static_cast<std::int64_t>(rows.size()), "session", "sessions");
  if (isKnown) text += ", " + withDecimal(sum) + " messages a second";
  if (overloads) text += ", " + counted(*overloads, "overload", "overloads");
  return text;
}

std::string deviceLine(const DeviceHealth& device) {
  std::string text = printable(device.device) + (device.isInput ? " (input): " : ": ");
  if (device.load) {
    text += percent(*device.load) + " of the period, less than " + percent(device.worst.value_or(0)) +
            " at worst";
  } else {
    text += "idle";
  }
  if (device.xruns) text += ", " + counted(*device.xruns, "xrun", "xruns");
  return text;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TopFrame.h"

#include <algorithm>
#include <sstream>
#include <utility>

#include "tools/twctl/show/Table.h"
#include "tools/twctl/show/TopCells.h"

namespace tonewerk {
namespace {

void appendTable(std::vector<std::string>& lines, const TopCells& cells) {
  std::ostringstream text;
  {
    std::vector<std::string> titles;
    for (const TopColumn& column : cells.columns) titles.emplace_back(column.title);
    Table table(text, false, std::move(titles));
    for (const std::vector<TopCell>& row : cells.rows) {
      std::vector<Table::Cell> shown;
      shown.reserve(row.size());
      for (const TopCell& cell : row) shown.emplace_back(Value(cell.text));
      table.add(std::move(shown));
    }
  }
  std::istringstream stream(text.str());
  for (std::string line; std::getline(stream, line);) lines.push_back(std::move(line));
}

}  // namespace

std::vector<std::string> topFrame(const std::vector<SessionRow>& rows, const AudioHealth& health) {
  std::vector<std::string> lines{topSummary(rows)};
  for (const DeviceHealth& device : health.devices) lines.push_back(deviceLine(device));
  appendTable(lines, sessionCells(rows));
  if (!health.nodes.empty()) {
    lines.emplace_back();
    appendTable(lines, nodeCells(health.nodes));
  }
  return lines;
}

std::string runningTime(double seconds) {
  constexpr std::int64_t kMinute = 60;
  constexpr std::int64_t kHour = 60 * kMinute;
  constexpr std::int64_t kDay = 24 * kHour;
  const std::int64_t whole = Value(std::max(seconds, 0.0)).integer();
  const auto twoDigits = [](std::int64_t number) {
    return (number < 10 ? "0" : "") + std::to_string(number);
  };
  if (whole < kMinute) return std::to_string(whole) + " s";
  const std::string tail = twoDigits(whole % kMinute);
  if (whole < kHour) return std::to_string(whole / kMinute) + ":" + tail;
  const std::string clock =
      std::to_string(whole % kDay / kHour) + ":" + twoDigits(whole % kHour / kMinute) + ":" + tail;
  return whole < kDay ? clock : std::to_string(whole / kDay) + " d " + clock;
}

ValueMap topObject(const SessionRow& row) {
  ValueMap object = row.session;
  if (row.messagesPerSecond) object.set("messagesPerSecond", *row.messagesPerSecond);
  if (row.redundantShare) object.set("redundantShare", *row.redundantShare);
  return object;
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TopFrame.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <sstream>
#include <utility>

#include "protocol/WatchKeys.h"
#include "tools/twctl/show/Table.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr std::size_t kHeadLines = 2;  // the sums and the columns

std::string withDecimal(double number) {
  std::array<char, 64> text{};
  std::snprintf(text.data(), text.size(), "%.1f", number);
  return text.data();
}

std::string clientOf(const ValueMap& session) {
  std::string text = session.text(kWatchKeyProcessName);
  if (text.empty()) text = session.boolean(kWatchKeySingleMessageSession) ? "(the daemon)" : "?";
  return text + " " + session.text(kWatchKeyProcessIdentifier);
}

std::string shareOf(const SessionRow& row) {
  return row.redundantShare ? withDecimal(*row.redundantShare * 100) + " %" : "-";
}

std::string runningTimeOf(const ValueMap& session) {
  const Value* seconds = session.find(kWatchKeySeconds);
  return seconds == nullptr ? "-" : runningTime(seconds->number());
}

std::string summaryOf(const std::vector<SessionRow>& rows) {
  double sum = 0;
  bool isKnown = false;
  for (const SessionRow& row : rows) {
    sum += row.messagesPerSecond.value_or(0);
    isKnown = isKnown || row.messagesPerSecond;
  }
  std::string text = std::to_string(rows.size()) + (rows.size() == 1 ? " session" : " sessions");
  return isKnown ? text + ", " + withDecimal(sum) + " messages a second" : text;
}

std::vector<std::string> linesOf(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(std::move(line));
  return lines;
}

// The first `columns` characters, as utf8Characters() counts them.
std::string cutTo(std::size_t columns, const std::string& line) {
  std::size_t characters = 0;
  for (std::size_t at = 0; at < line.size(); ++at) {
    if (isUtf8Continuation(line[at])) continue;
    if (characters++ == columns) return line.substr(0, at);
  }
  return line;
}

}  // namespace

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

std::vector<std::string> topFrame(const std::vector<SessionRow>& rows,
                                  const std::optional<TerminalSize>& size) {
  std::size_t shown = rows.size();
  if (size && kHeadLines + rows.size() > size->rows) {
    shown = size->rows > kHeadLines ? size->rows - kHeadLines - 1 : 0;
  }
  std::ostringstream text;
  {
    Table table(text, false,
                {"session", "service", "application", "client", "msg/s", "redundant", "running"});
    for (std::size_t at = 0; at < shown; ++at) {
      const ValueMap& session = rows[at].session;
      const auto& rate = rows[at].messagesPerSecond;
      table.add({Value(session.integer(kWatchKeyReporterID)), Value(session.text(kWatchKeyServiceName)),
                 Value(session.text(kWatchKeyApplication)), Value(clientOf(session)),
                 Value(rate ? withDecimal(*rate) : "-"), Value(shareOf(rows[at])),
                 Value(runningTimeOf(session))});
    }
  }
  std::vector<std::string> lines = linesOf(text.str());
  lines.insert(lines.begin(), summaryOf(rows));
  if (shown < rows.size()) lines.push_back("... and " + std::to_string(rows.size() - shown) + " more");
  if (!size) return lines;
  if (lines.size() > size->rows) lines.resize(size->rows);
  for (std::string& line : lines) line = cutTo(size->columns, line);
  return lines;
}

ValueMap topObject(const SessionRow& row) {
  ValueMap object = row.session;
  if (row.messagesPerSecond) object.set("messagesPerSecond", *row.messagesPerSecond);
  if (row.redundantShare) object.set("redundantShare", *row.redundantShare);
  return object;
}

}  // namespace tonewerk

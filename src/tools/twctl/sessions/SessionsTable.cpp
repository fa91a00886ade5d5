// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionsTable.h"

#include <algorithm>
#include <string>
#include <vector>

#include "tools/twctl/show/TopFrame.h"

namespace tonewerk {
namespace {

std::vector<std::string> columns(bool asJson) {
  if (asJson) {
    return {"id",       "reporter_id",        "service",  "application", "process",
            "user_id",  "started_at",         "ended_at", "seconds",     "ending",
            "messages", "redundant_messages", "overloads"};
  }
  return {"id",     "began",    "length",    "application", "service",
          "ending", "messages", "redundant", "overloads",   "reporter"};
}

Table::Cell cellOf(const std::optional<std::string>& text) {
  return text ? Table::Cell(Value(*text)) : Table::Cell("-", "null");
}

template <typename Number>
Table::Cell cellOf(const std::optional<Number>& number) {
  return number ? Table::Cell(Value(*number)) : Table::Cell("-", "null");
}

}  // namespace

SessionsTable::SessionsTable(std::ostream& out, bool asJson, double now, std::optional<std::size_t> width)
    : asJson_(asJson), now_(now), table_(out, asJson, columns(asJson)) {
  if (!width) return;
  table_.fit(*width);
  table_.dropWhenNarrow({"reporter", "redundant", "messages", "service", "overloads", "ending"});
}

void SessionsTable::add(const StoredSession& session) {
  const double seconds = std::max(0.0, session.endedAt.value_or(now_) - session.startedAt);
  if (asJson_) {
    table_.add({Value(session.id), Value(session.reporterID), cellOf(session.service),
                cellOf(session.application), cellOf(session.process), Value(session.user),
                Value(session.startedAt), cellOf(session.endedAt), Value(seconds), cellOf(session.ending),
                cellOf(session.messages), cellOf(session.redundantMessages), cellOf(session.overloads)});
    return;
  }
  // Whole seconds: when a session began is not asked for more exactly, and the columns stay narrow.
  const auto began = static_cast<double>(static_cast<std::int64_t>(session.startedAt));
  table_.add({Value(session.id), Table::Cell::time(began), Value(runningTime(seconds)),
              cellOf(session.application), cellOf(session.service), Value(session.ending.value_or("running")),
              cellOf(session.messages), cellOf(session.redundantMessages), cellOf(session.overloads),
              Value(session.reporterID)});
}

}  // namespace tonewerk

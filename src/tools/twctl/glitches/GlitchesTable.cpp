// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/GlitchesTable.h"

#include <cmath>
#include <vector>

namespace tonewerk {
namespace {

std::vector<std::string> glitchColumns(bool asJson) {
  if (asJson) {
    return {"id",
            "at",
            "glitch_id",
            "cause",
            "first_cause",
            "confidence",
            "culprit_application",
            "culprit_process",
            "culprit_pid",
            "culprit_node",
            "device",
            "chain",
            "over_ms",
            "period_ms",
            "quantum",
            "rate",
            "lost_ms",
            "overloads",
            "sessions",
            "application",
            "applications",
            "reason"};
  }
  return {"id", "at", "cause", "culprit", "heard by", "over", "lost", "times"};
}

Table::Cell cellOf(const std::optional<std::string>& text) {
  return text ? Table::Cell(Value(*text)) : Table::Cell("-", "null");
}

template <typename Number>
Table::Cell cellOf(const std::optional<Number>& number) {
  return number ? Table::Cell(Value(*number)) : Table::Cell("-", "null");
}

Value millisecondsOf(const std::optional<double>& milliseconds) {
  return milliseconds ? millisecondsText(*milliseconds) : std::string("-");
}

std::string hearersOf(const StoredGlitch& glitch) {
  std::string text = glitch.heardBy.value_or("-");
  if (glitch.applications > 1) text += " and " + std::to_string(glitch.applications - 1) + " more";
  return text;
}

}  // namespace

GlitchesTable::GlitchesTable(std::ostream& out, bool asJson, std::optional<std::size_t> width)
    : asJson_(asJson), table_(out, asJson, glitchColumns(asJson)) {
  if (!width) return;
  table_.fit(*width);
  table_.dropWhenNarrow({"times", "lost", "heard by", "over"});
}

void GlitchesTable::add(const StoredGlitch& glitch) {
  const GlitchVerdict& verdict = glitch.verdict;
  if (asJson_) {
    table_.add({Value(verdict.event),
                Value(verdict.at),
                cellOf(verdict.id),
                cellOf(verdict.cause),
                cellOf(verdict.firstCause),
                cellOf(verdict.confidence),
                cellOf(verdict.culpritApplication),
                cellOf(verdict.culpritProcess),
                cellOf(verdict.culpritPid),
                cellOf(verdict.culpritNode),
                cellOf(verdict.device),
                cellOf(verdict.chain),
                cellOf(verdict.overMs),
                cellOf(verdict.periodMs),
                cellOf(verdict.quantum),
                cellOf(verdict.rate),
                cellOf(glitch.lostMs),
                Value(glitch.overloads),
                Value(glitch.sessions),
                cellOf(glitch.heardBy),
                Value(glitch.applications),
                cellOf(verdict.reason)});
    return;
  }
  // Whole seconds, so that the columns stay narrow.
  const double at = std::floor(verdict.at);
  table_.add({Value(verdict.event), Table::Cell::time(at), Value(verdict.causeText()),
              Value(culpritOf(verdict)), Value(hearersOf(glitch)), millisecondsOf(verdict.overMs),
              millisecondsOf(glitch.lostMs), Value(glitch.overloads)});
}

GlitchSumsTable::GlitchSumsTable(std::ostream& out, bool asJson, const std::string& keyName,
                                 std::optional<std::size_t> width)
    : asJson_(asJson),
      table_(out, asJson,
             asJson ? std::vector<std::string>{keyName, "glitches", "share", "lost_ms", "worst_over_ms",
                                               "first_at", "last_at"}
                    : std::vector<std::string>{keyName, "glitches", "share", "lost", "worst", "last"}) {
  if (!width) return;
  table_.fit(*width);
  table_.dropWhenNarrow({"last", "lost", "worst"});
}

void GlitchSumsTable::add(const GlitchSum& sum) {
  if (asJson_) {
    table_.add({cellOf(sum.key), Value(sum.glitches), Value(sum.share), Value(sum.lostMs),
                cellOf(sum.worstMs), Value(sum.firstAt), Value(sum.lastAt)});
    return;
  }
  constexpr double kPercent = 100.0;
  table_.add({Value(sum.key.value_or("not known")), Value(sum.glitches),
              Value(std::to_string(std::lround(sum.share * kPercent)) + " %"),
              Value(millisecondsText(sum.lostMs)), millisecondsOf(sum.worstMs),
              Table::Cell::time(std::floor(sum.lastAt))});
}

}  // namespace tonewerk

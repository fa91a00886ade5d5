// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/GlitchVerdict.h"

#include <cmath>

#include "values/Value.h"

namespace tonewerk {

const char* GlitchVerdict::columns() {
  return "id, coalesce(began_at, at), substr(glitch_id, 1, 100), session, substr(application, 1, 100), "
         "substr(cause, 1, 40), substr(first_cause, 1, 40), confidence, substr(culprit_application, 1, 100), "
         "substr(culprit_process, 1, 100), culprit_pid, substr(culprit_node, 1, 100), substr(node, 1, 100), "
         "substr(device, 1, 100), substr(chain, 1, 400), over_ms, period_ms, quantum, rate, lost_ms, "
         "overloads, substr(reason, 1, 600)";
}

GlitchVerdict GlitchVerdict::of(const ViewRow& row) {
  int column = 0;
  GlitchVerdict verdict;
  verdict.event = row.integer(column++).value_or(0);
  verdict.at = row.number(column++).value_or(0.0);
  verdict.id = row.text(column++);
  verdict.session = row.integer(column++);
  verdict.application = row.text(column++);
  verdict.cause = row.text(column++);
  verdict.firstCause = row.text(column++);
  verdict.confidence = row.number(column++);
  verdict.culpritApplication = row.text(column++);
  verdict.culpritProcess = row.text(column++);
  verdict.culpritPid = row.integer(column++);
  verdict.culpritNode = row.text(column++);
  verdict.node = row.text(column++);
  verdict.device = row.text(column++);
  verdict.chain = row.text(column++);
  verdict.overMs = row.number(column++);
  verdict.periodMs = row.number(column++);
  verdict.quantum = row.integer(column++);
  verdict.rate = row.integer(column++);
  verdict.lostMs = row.number(column++);
  verdict.overloads = row.integer(column++).value_or(1);
  verdict.reason = row.text(column++);
  return verdict;
}

std::string GlitchVerdict::causeText() const {
  return sharedCause().value_or(isJudged() ? "not known" : "not judged");
}

std::string culpritOf(const GlitchVerdict& verdict) {
  const std::string number = verdict.culpritPid ? std::to_string(*verdict.culpritPid) : "";
  if (verdict.culpritApplication) {
    std::string process = verdict.culpritProcess.value_or("");
    if (!number.empty()) process += (process.empty() ? "" : ", ") + number;
    return *verdict.culpritApplication + (process.empty() ? "" : " (" + process + ")");
  }
  const std::string cause = verdict.sharedCause().value_or("");
  if (cause == "device") return "the device" + (verdict.device ? " " + *verdict.device : "");
  if (cause == "graph changed") return "a change of the graph";
  if (cause == "system slept") return "the system's sleep";
  if (verdict.culpritProcess) return *verdict.culpritProcess + (number.empty() ? "" : " (" + number + ")");
  return verdict.culpritNode.value_or("not known");
}

std::string millisecondsText(double milliseconds) {
  constexpr double kSecond = 1000.0;
  const bool isLong = milliseconds >= kSecond;
  const double number = isLong ? milliseconds / kSecond : milliseconds;
  // Three digits, or whole numbers.
  const double step = number < 10.0 ? 100.0 : number < 100.0 ? 10.0 : 1.0;
  const double rounded = std::round(number * step) / step;
  return textOf(rounded) + (isLong ? " s" : " ms");
}

}  // namespace tonewerk

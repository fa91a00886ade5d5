// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/sessions/ViewRows.h"

namespace tonewerk {

// What a row of the store's view `glitch` says, without its cycles. What is not known is none. Long texts are
// cut.
struct GlitchVerdict {
  std::int64_t event = 0;
  double at = 0.0;  // when it happened, in seconds since 1970
  std::optional<std::string> id;
  std::optional<std::int64_t> session;
  std::optional<std::string> application;  // of the session
  std::optional<std::string> cause;        // of the gap in the session
  std::optional<std::string> firstCause;   // of the first in the chain
  std::optional<double> confidence;        // 0 to 1
  std::optional<std::string> culpritApplication;
  std::optional<std::string> culpritProcess;
  std::optional<std::int64_t> culpritPid;
  std::optional<std::string> culpritNode;
  std::optional<std::string> node;
  std::optional<std::string> device;
  std::optional<std::string> chain;
  std::optional<double> overMs;
  std::optional<double> periodMs;
  std::optional<std::int64_t> quantum;  // frames
  std::optional<std::int64_t> rate;     // Hz
  std::optional<double> lostMs;
  std::int64_t overloads = 1;
  std::optional<std::string> reason;

  // The columns for verdictOf(), of the view or of a query with its columns.
  static const char* columns();
  // Reads these columns from the first one of the row on.
  static GlitchVerdict of(const ViewRow& row);

  bool isJudged() const { return id || cause || firstCause; }
  // "late", "not known", or "not judged".
  std::string causeText() const;
  // The cause of the first in the chain, or else that of the gap.
  const std::optional<std::string>& sharedCause() const { return firstCause ? firstCause : cause; }
};

// Who caused it, as briefly as that can be said: "org.example.Studio (studio, 4711)", "backup (990)", "the
// device speaker". "not known" when it is not.
[[nodiscard]] std::string culpritOf(const GlitchVerdict& verdict);

// "5.33 ms", "1.2 s"
[[nodiscard]] std::string millisecondsText(double milliseconds);

}  // namespace tonewerk

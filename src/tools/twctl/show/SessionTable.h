// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "protocol/AudioEvent.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {

// Prints sessions for `twctl list` and `twctl validate`.
class SessionTable {
 public:
  explicit SessionTable(const Tool& tool);

  void add(ReporterID reporterID, AudioServiceType serviceType);

 private:
  Table table_;
};

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "tools/twctl/Tool.h"
#include "tools/twctl/sessions/SessionReasons.h"
#include "tools/twctl/sessions/StoredSessions.h"

namespace tonewerk {

// Takes the requests of a session from the journal and plays them to the core, which tells its reasons.
class SessionReplay {
 public:
  // Null when that is not possible; why() then says why. Valid as long as the object.
  ReasonedLife* play(const Tool& tool, const StoredSession& session);
  const std::string& why() const { return why_; }

 private:
  std::vector<ReasonedLife> lives_;
  std::string why_;
};

}  // namespace tonewerk

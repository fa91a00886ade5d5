// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "tools/twctl/Tool.h"
#include "tools/twctl/completion/Candidate.h"
#include "tools/twctl/completion/CompletionPoint.h"

namespace tonewerk {

// What a shell itself completes.
enum class ShellPart { kNone, kFiles, kRecordings };

// What can stand at a point of kind kValue or kArgument, beyond the choices that the tree knows.
struct ValueSources {
  using Source = std::function<std::vector<Candidate>()>;

  ShellPart shell = ShellPart::kNone;
  std::vector<Candidate> known;  // without looking anything up
  Source lookup = {};            // asks the daemon, or reads its files, and may take long; null for none
};

// `tool` gives the directories and the daemon's socket; nothing is printed to it. The candidates are those
// that begin with the point's word, in no particular order, and only such as isOfferable().
ValueSources valueSourcesFor(const CompletionPoint& point, const Tool& tool);

}  // namespace tonewerk

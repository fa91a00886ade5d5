// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/SinkTable.h"

#include <cstdint>
#include <string>

#include "protocol/WatchKeys.h"
#include "values/PrintableText.h"

namespace tonewerk {

SinkTable::SinkTable(std::ostream& out) : table_(out, false, {"sink", "waiting", "dropped", "hangs"}) {}

void SinkTable::add(const ValueMap& sink) {
  const std::int64_t seconds = sink.integer(kWatchKeyHangs);
  table_.add({Value(printable(sink.text(kWatchKeyName))), Value(sink.integer(kWatchKeyWaiting)),
              Value(sink.integer(kWatchKeyDropped)),
              Table::Cell(seconds == 0 ? "no" : std::to_string(seconds) + " s", std::to_string(seconds))});
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/TopLoop.h"

#include "tools/twctl/show/SessionRates.h"
#include "tools/twctl/show/TopFrame.h"

namespace tonewerk {

void runTop(const SessionSource& source, LiveScreen& screen, double interval) {
  SessionRates rates;
  for (;;) {
    const auto listing = source();
    if (!listing) return;
    const double now = screen.now();
    const std::vector<SessionRow> rows = rates.rowsOf(*listing, now);
    LiveScreen::Event event{};
    do {
      screen.show(topFrame(rows, screen.size()));
      event = screen.waitUntil(now + interval);
    } while (event == LiveScreen::Event::kResized);
    if (event == LiveScreen::Event::kQuit) return;
  }
}

}  // namespace tonewerk

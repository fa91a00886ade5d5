// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/TopLoop.h"

#include "tools/twctl/show/SessionRates.h"

namespace tonewerk {

void runTop(const SessionSource& sessions, const HealthSource& health, LiveScreen& screen, double interval) {
  SessionRates rates;
  TopView view;
  for (;;) {
    const double now = screen.now();
    if (!view.isPaused()) {
      const auto listing = sessions();
      if (!listing) return;
      view.update(rates.rowsOf(*listing, screen.now()), health());
    }
    LiveScreen::Event event{};
    do {
      screen.show(view.page(screen.size()));
      event = screen.waitUntil(now + interval);
      if (event == LiveScreen::Event::kKey && !view.press(screen.key())) return;
    } while (event == LiveScreen::Event::kResized || event == LiveScreen::Event::kKey);
    if (event == LiveScreen::Event::kQuit) return;
  }
}

}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/TopLoop.h"

#include <deque>
#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::SizeIs;

// A screen whose times and events a test sets in advance. After the last one the user quits.
class ScriptedScreen final : public LiveScreen {
 public:
  TerminalSize size() const override { return size_; }
  void show(const std::vector<std::string>& lines) override { pages.push_back(lines); }
  double now() const override { return now_; }
  Event waitUntil(double time) override {
    const Event event = events.empty() ? Event::kQuit : events.front();
    if (!events.empty()) events.pop_front();
    if (event == Event::kTime) now_ = time;
    if (event == Event::kResized) size_.rows = 3;
    return event;
  }

  std::deque<Event> events;
  std::vector<std::vector<std::string>> pages;

 private:
  double now_ = 100;
  TerminalSize size_;
};

using Event = LiveScreen::Event;

class TopLoopTest : public testing::Test {
 protected:
  // Returns another listing at each call, with five more messages.
  SessionSource source = [this]() -> std::optional<std::vector<ValueMap>> {
    if (++listings > most) return std::nullopt;
    return std::vector<ValueMap>(2, ValueMap{{"reporterID", 7}, {"messages", 5 * listings}});
  };
  int listings = 0;
  int most = 100;
  ScriptedScreen screen;
};

TEST_F(TopLoopTest, ShowsAPageAndEndsWhenTheUserQuits) {
  runTop(source, screen, 1);
  EXPECT_THAT(screen.pages, SizeIs(1));
  EXPECT_EQ(screen.pages.at(0).at(0), "2 sessions");
}

TEST_F(TopLoopTest, MeasuresOverTheInterval) {
  screen.events = {Event::kTime};
  runTop(source, screen, 2);
  ASSERT_THAT(screen.pages, SizeIs(2));
  EXPECT_EQ(screen.pages[1].at(0), "2 sessions, 5.0 messages a second");
}

TEST_F(TopLoopTest, ShowsTheSamePageAgainInANewWindowSize) {
  screen.events = {Event::kResized};
  runTop(source, screen, 1);
  EXPECT_EQ(listings, 1);
  ASSERT_THAT(screen.pages, SizeIs(2));
  EXPECT_THAT(screen.pages[0], SizeIs(4));
  EXPECT_THAT(screen.pages[1], ElementsAre("2 sessions", "... and 2 more"));
}

TEST_F(TopLoopTest, EndsWhenThereIsNothingToShowAnyMore) {
  screen.events = {Event::kTime, Event::kTime};
  most = 1;
  runTop(source, screen, 1);
  EXPECT_THAT(screen.pages, SizeIs(1));
  EXPECT_EQ(listings, 2);
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/TopLoop.h"

#include <deque>
#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::SizeIs;

// A screen whose times, events and keys a test sets in advance. After the last one the user quits.
class ScriptedScreen final : public LiveScreen {
 public:
  TerminalSize size() const override { return size_; }
  void show(const std::vector<TopLine>& lines) override { pages.push_back(lines); }
  double now() const override { return now_; }
  char32_t key() const override { return key_; }
  Event waitUntil(double time) override {
    const Event event = events.empty() ? Event::kQuit : events.front();
    if (!events.empty()) events.pop_front();
    if (event == Event::kTime) now_ = time;
    if (event == Event::kResized) size_.rows = 3;
    if (event == Event::kKey) {
      key_ = keys.front();
      keys.pop_front();
    }
    return event;
  }

  std::deque<Event> events;
  std::deque<char32_t> keys;
  std::vector<std::vector<TopLine>> pages;

 private:
  double now_ = 100;
  TerminalSize size_;
  char32_t key_ = 0;
};

using Event = LiveScreen::Event;

class TopLoopTest : public testing::Test {
 protected:
  void run(double interval = 1) {
    runTop(
        source, [] { return AudioHealth(); }, screen, interval);
  }
  std::string firstLine(std::size_t page) const { return screen.pages.at(page).at(0).text; }

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
  run();
  EXPECT_THAT(screen.pages, SizeIs(1));
  EXPECT_EQ(firstLine(0), "2 sessions");
}

TEST_F(TopLoopTest, MeasuresOverTheInterval) {
  screen.events = {Event::kTime};
  run(2);
  ASSERT_THAT(screen.pages, SizeIs(2));
  EXPECT_EQ(firstLine(1), "2 sessions, 5.0 messages a second");
}

TEST_F(TopLoopTest, ShowsTheSamePageAgainInANewWindowSize) {
  screen.events = {Event::kResized};
  run();
  EXPECT_EQ(listings, 1);
  ASSERT_THAT(screen.pages, SizeIs(2));
  EXPECT_GT(screen.pages[0].size(), 3U);
  EXPECT_THAT(screen.pages[1], SizeIs(3));
}

TEST_F(TopLoopTest, AKeyChangesThePageAtOnceAndAsksNothing) {
  screen.events = {Event::kKey};
  screen.keys = {U'?'};
  run();
  EXPECT_EQ(listings, 1);
  ASSERT_THAT(screen.pages, SizeIs(2));
  EXPECT_EQ(firstLine(1), "twctl top");
}

TEST_F(TopLoopTest, EndsWithTheKeyThatQuits) {
  screen.events = {Event::kTime, Event::kKey, Event::kTime};
  screen.keys = {U'q'};
  run();
  EXPECT_THAT(screen.pages, SizeIs(2));
}

TEST_F(TopLoopTest, AsksNothingWhilePaused) {
  screen.events = {Event::kKey, Event::kTime, Event::kTime, Event::kKey, Event::kTime};
  screen.keys = {U'p', U'p'};
  run();
  EXPECT_EQ(listings, 2);
  // Over three intervals, in which five messages came.
  EXPECT_EQ(firstLine(screen.pages.size() - 1), "2 sessions, 3.3 messages a second");
}

TEST_F(TopLoopTest, EndsWhenThereIsNothingToShowAnyMore) {
  screen.events = {Event::kTime, Event::kTime};
  most = 1;
  run();
  EXPECT_THAT(screen.pages, SizeIs(1));
  EXPECT_EQ(listings, 2);
}

}  // namespace
}  // namespace tonewerk

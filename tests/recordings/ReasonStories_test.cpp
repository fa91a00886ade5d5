// SPDX-License-Identifier: Apache-2.0
//
// Plays each recording of this directory and of examples/ to the core with a trace of reasons, and compares
// the story of each session with the text in this directory. To accept new texts, see CONTRIBUTING.md.
#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "protocol/Requests.h"
#include "support/ScopedTimeZone.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "tools/offline/OfflineReplay.h"
#include "tools/offline/ReasonRecorder.h"
#include "tools/recording/RecordingFile.h"
#include "tools/twctl/sessions/SessionStory.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

const fs::path kSource = TONEWERK_SOURCE_DIR;

// A recording that has been played, and what is known of its sessions.
class Played {
 public:
  explicit Played(const fs::path& file) {
    MemoryLog log;
    const LogCategory category(log, "com.orvane.tonewerk", "twrs");
    std::string problem;
    const auto recording = readRecordingFile(file, requests::all(), json_, problem);
    EXPECT_TRUE(recording) << problem;
    std::stringstream reasons;
    ReasonRecorder recorder(reasons);
    {
      const ReasonTrace::Scope scope(recorder);
      OfflineReplay replay(json_, category, [](const RecordedStep&, const ReplyError&) {});
      const std::atomic<bool> isInterrupted = false;
      EXPECT_EQ(replay.play(*recording, directory_.path("reports.db"), isInterrupted), "");
    }
    const auto lives = readReasons(reasons, json_, problem);
    EXPECT_TRUE(lives) << problem;
    lives_ = *lives;
    EXPECT_EQ(reader_.open(directory_.path("reports.db")), "");
    EXPECT_TRUE(readSessions(reader_, {}, problem, [this](const StoredSession& session) {
      sessions_.push_back(session);
    })) << problem;
  }

  const std::vector<StoredSession>& sessions() const { return sessions_; }
  const std::vector<ReasonedLife>& lives() const { return lives_; }
  SqlReader& reader() { return reader_; }

  // Calls visit(const SessionStory&) with the story of a session.
  template <typename Visit>
  void tell(const StoredSession& session, std::size_t width, Visit visit) {
    std::string problem;
    const auto records = readRecords(reader_, session.id, problem);
    ASSERT_TRUE(records) << problem;
    const auto events = readPayloads(reader_, session.id, problem);
    ASSERT_TRUE(events) << problem;
    std::optional<ReasonedLife> life;
    if (const ReasonedLife* found = lifeOf(lives_, session)) life = *found;
    if (life) nameEvents(*life, *events, json_);
    visit(SessionStory(session, *records, life ? &*life : nullptr, "the journal no longer has its requests",
                       width));
  }

 private:
  NlohmannJsonService json_;
  TemporaryDirectory directory_;
  std::vector<ReasonedLife> lives_;
  SqlReader reader_;
  std::vector<StoredSession> sessions_;
};

std::vector<fs::path> recordings() {
  std::vector<fs::path> found;
  for (const char* folder : {"examples", "tests/recordings"}) {
    for (const auto& entry : fs::directory_iterator(kSource / folder)) {
      if (entry.path().extension() == ".jsonl") found.push_back(entry.path());
    }
  }
  std::sort(found.begin(), found.end());
  return found;
}

class ReasonStoriesTest : public testing::TestWithParam<fs::path> {
  ScopedTimeZone zone_{"UTC"};
};

TEST_P(ReasonStoriesTest, TellsTheExpectedStories) {
  constexpr std::size_t kWidth = 100;
  const fs::path expectation = kSource / "tests/recordings" / (GetParam().stem().string() + ".story");
  Played played(GetParam());
  std::string actual;
  for (const StoredSession& session : played.sessions()) {
    played.tell(session, kWidth, [&](const SessionStory& story) { actual += story.whole() + "--------\n"; });
  }
  if (std::getenv("TONEWERK_ACCEPT_RECORDINGS") != nullptr) std::ofstream(expectation) << actual;
  std::ostringstream expected;
  expected << std::ifstream(expectation).rdbuf();
  EXPECT_EQ(expected.str(), actual) << expectation;
}

INSTANTIATE_TEST_SUITE_P(All, ReasonStoriesTest, testing::ValuesIn(recordings()), [](const auto& recording) {
  std::string name = recording.param.stem();
  std::replace(name.begin(), name.end(), '-', '_');
  return name;
});

std::vector<std::string> linesOf(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(std::move(line));
  return lines;
}

class VolumeStoryTest : public testing::Test {
 protected:
  std::string tell(std::size_t width, std::string (SessionStory::*part)(const std::string&) const,
                   const std::string& argument) {
    std::string text;
    played_.tell(played_.sessions().front(), width,
                 [&](const SessionStory& story) { text = (story.*part)(argument); });
    return text;
  }

  Played played_{kSource / "tests/recordings/volume.jsonl"};
};

TEST_F(VolumeStoryTest, SaysWhyAStretchHasNoSummary) {
  EXPECT_THAT(tell(200, &SessionStory::summaries, "Volume"),
              testing::HasSubstr("QMSessionVolume changed from 0.25 to 0.75 (message 6) -> no summary: 0.5 s "
                                 "is not longer than 0.5 s\n"));
}

TEST_F(VolumeStoryTest, KeepsLinesWithinTheWidth) {
  for (const std::size_t width : {60U, 200U}) {
    std::string text;
    played_.tell(played_.sessions().front(), width, [&](const SessionStory& story) { text = story.whole(); });
    std::size_t longest = 0;
    for (const std::string& line : linesOf(text)) longest = std::max(longest, line.size());
    EXPECT_LE(longest, width) << text;
    EXPECT_GT(longest, width / 2) << text;
  }
}

TEST_F(VolumeStoryTest, SaysWhatMadeAnEvent) {
  std::string problem;
  const StoredSession& session = played_.sessions().front();
  const auto records = readRecords(played_.reader(), session.id, problem);
  ASSERT_TRUE(records) << problem;
  const std::int64_t summary = records->summaries.at({"Volume", 3});
  const auto event = readEvent(played_.reader(), summary, problem);
  ASSERT_TRUE(event) << problem;
  std::string text;
  played_.tell(session, 200, [&](const SessionStory& story) { text = story.event(*event); });
  EXPECT_THAT(text, testing::HasSubstr("+8.5 s to +20.5 s, 12 s  active_devices changed from Speaker to "
                                       "Headphones (message 7) -> Volume Summary 3 of 7, event " +
                                       std::to_string(summary) + "; made of messages 1, 4, 6 and 7\n"));
  EXPECT_THAT(text, testing::HasSubstr("6  +8.5 s  Volume Generic: QMSessionVolume=0.75\n"));
  // Messages 1 and 4 said the device and the format, long before the stretch.
  EXPECT_THAT(text, testing::HasSubstr("\n  1  +1 s  Setup Generic: "));
  EXPECT_THAT(text, testing::HasSubstr("active_devices=Speaker"));
  EXPECT_THAT(text, testing::HasSubstr("\n  4  +6 s  Setup Setup: mFormatID=aac"));
}

TEST_F(VolumeStoryTest, SaysOfWhatTheSummaryOfASessionIsMade) {
  StoredEventRow event;
  event.category = "Session_Generic";
  event.type = "Summary";
  event.source = "derived";
  std::string text;
  played_.tell(played_.sessions().front(), 200,
               [&](const SessionStory& story) { text = story.event(event); });
  EXPECT_THAT(text, testing::HasSubstr("The daemon makes one for each session when it stops: of all its "
                                       "messages,"));
}

// A replay stops the session, so it makes summaries that the daemon has not made.
TEST_F(VolumeStoryTest, TellsNothingOfASessionThatRunsAsIfItHadStopped) {
  StoredSession session = played_.sessions().front();
  session.endedAt.reset();
  ReasonedLife life = played_.lives().front();
  nameEvents(life, {}, NlohmannJsonService());
  const SessionRecords records;
  const std::string text = SessionStory(session, records, &life, "", 200).whole();
  EXPECT_THAT(text, testing::Not(testing::HasSubstr("Session_Generic")));
  EXPECT_THAT(text, testing::Not(testing::HasSubstr("does not have")));
  EXPECT_THAT(text, testing::HasSubstr("If it stopped now:\nVolume summaries: 7."));
}

TEST(RedundancyStoryTest, SaysWhichMessageARedundantOneRepeats) {
  Played played(kSource / "tests/recordings/redundancy.jsonl");
  const ReasonedLife& life = played.lives().front();
  const auto redundant = std::find_if(life.messages.begin(), life.messages.end(),
                                      [](const ValueMap& message) { return message.boolean("redundant"); });
  ASSERT_NE(redundant, life.messages.end());
  const std::int64_t number = redundant->integer("number");
  const std::int64_t repeated = redundant->integer("repeats");
  EXPECT_LT(repeated, number);
  std::string text;
  std::string earlier;
  played.tell(played.sessions().front(), 200, [&](const SessionStory& story) {
    text = story.message(number);
    earlier = story.message(repeated);
  });
  EXPECT_THAT(text, testing::HasSubstr("redundant, it repeats message " + std::to_string(repeated) +
                                       " in everything but its times"));
  EXPECT_THAT(earlier, testing::HasSubstr(std::to_string(number)));
  EXPECT_THAT(earlier, testing::HasSubstr("repeated it and"));
}

TEST(RedundancyStoryTest, KnowsAllMessagesThatAreEqual) {
  const Played played(kSource / "tests/recordings/redundancy.jsonl");
  const ReasonedLife& life = played.lives().front();
  const auto numbersEqualTo = [&life](std::int64_t number) {
    std::vector<std::int64_t> numbers;
    for (const ValueMap* message : life.equalTo(number)) numbers.push_back(message->integer("number"));
    return numbers;
  };
  EXPECT_THAT(numbersEqualTo(1), testing::ElementsAre(1, 2));
  EXPECT_THAT(numbersEqualTo(2), testing::ElementsAre(1, 2));
  EXPECT_THAT(numbersEqualTo(5), testing::ElementsAre(5));
  EXPECT_THAT(numbersEqualTo(99), testing::IsEmpty());
}

TEST(RedundancyStoryTest, SaysThatNothingRan) {
  Played played(kSource / "tests/recordings/redundancy.jsonl");
  std::string text;
  played.tell(played.sessions().front(), 200,
              [&](const SessionStory& story) { text = story.summaries("Input"); });
  EXPECT_EQ(text,
            "Input summaries: 0. A stretch of input must be longer than 0.5 s.\n"
            "  none: no message said that input began (session_input_running)\n");
}

TEST(UnknownStoryTest, TellsWhatTheStoreKnowsWithoutTheJournal) {
  Played played(kSource / "tests/recordings/volume.jsonl");
  const StoredSession& session = played.sessions().front();
  std::string problem;
  const auto records = readRecords(played.reader(), session.id, problem);
  ASSERT_TRUE(records) << problem;
  const SessionStory story(session, *records, nullptr, "the journal no longer has its requests", 100);
  EXPECT_THAT(story.whole(), testing::HasSubstr("The reasons are not known: the journal no longer has its "
                                                "requests.\nThis is what the store knows.\n"));
  EXPECT_THAT(story.whole(),
              testing::HasSubstr("  +8.5 s to +20.5 s, 12 s  Volume on Speaker at volume 0.75"));
  EXPECT_EQ(story.summaries("Volume"),
            "The reasons are not known: the journal no longer has its requests.\n");
}

}  // namespace
}  // namespace tonewerk

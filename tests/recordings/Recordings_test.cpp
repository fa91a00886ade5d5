// SPDX-License-Identifier: Apache-2.0
//
// Plays each recording of this directory and of examples/ to the core, and compares what it records with the
// text in this directory. To accept new texts, see CONTRIBUTING.md.
#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sstream>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "protocol/Requests.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/recordings/StoreText.h"
#include "support/recordings/ViewsText.h"
#include "tools/offline/OfflineReplay.h"
#include "tools/recording/RecordingFile.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

const fs::path kSource = TONEWERK_SOURCE_DIR;
constexpr std::size_t kContext = 3;

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

std::vector<std::string> linesOf(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(std::move(line));
  return lines;
}

// The lines that differ, with those around them: those before and after the difference are equal in both.
std::string difference(const std::vector<std::string>& expected, const std::vector<std::string>& actual) {
  std::size_t same = 0;
  const std::size_t least = std::min(expected.size(), actual.size());
  while (same < least && expected[same] == actual[same]) ++same;
  std::size_t sameAtEnd = 0;
  while (sameAtEnd < least - same &&
         expected[expected.size() - 1 - sameAtEnd] == actual[actual.size() - 1 - sameAtEnd]) {
    ++sameAtEnd;
  }
  std::string text = "from line " + std::to_string(same + 1) + ":\n";
  const auto append = [&text](const auto& lines, std::size_t from, std::size_t to, const char* sign) {
    for (std::size_t at = from; at < std::min(to, lines.size()); ++at) text += sign + lines[at] + "\n";
  };
  append(expected, same - std::min(same, kContext), same, "  ");
  append(expected, same, expected.size() - sameAtEnd, "- ");
  append(actual, same, actual.size() - sameAtEnd, "+ ");
  append(actual, actual.size() - sameAtEnd, actual.size() - sameAtEnd + kContext, "  ");
  return text;
}

// What the recording gives: first the requests that were refused, then the store.
std::string play(const fs::path& file) {
  NlohmannJsonService json;
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  const TemporaryDirectory directory;
  std::string text;
  std::string problem;
  const auto recording = readRecordingFile(file, requests::all(), json, problem);
  if (recording) problem = OfflineReplay::problemWith(*recording, json);
  if (!problem.empty()) return problem + "\n";
  OfflineReplay replay(json, category, [&](const RecordedStep& call, const ReplyError& error) {
    text += "refused line " + std::to_string(call.line) + ": " + error.message + "\n";
  });
  const std::atomic<bool> isInterrupted = false;
  problem = replay.play(*recording, directory.path("reports.db"), isInterrupted);
  return problem.empty() ? text + storeText(directory.path()) + viewsText(directory.path()) : problem + "\n";
}

class RecordingsTest : public testing::TestWithParam<fs::path> {};

TEST_P(RecordingsTest, GivesTheExpectedReports) {
  const fs::path expectation = kSource / "tests/recordings" / (GetParam().stem().string() + ".expected");
  const std::string actual = play(GetParam());
  if (std::getenv("TONEWERK_ACCEPT_RECORDINGS") != nullptr) std::ofstream(expectation) << actual;
  std::ostringstream expected;
  expected << std::ifstream(expectation).rdbuf();
  EXPECT_TRUE(expected.str() == actual)
      << expectation << ": " << difference(linesOf(expected.str()), linesOf(actual));
}

INSTANTIATE_TEST_SUITE_P(All, RecordingsTest, testing::ValuesIn(recordings()), [](const auto& recording) {
  std::string name = recording.param.stem();
  std::replace(name.begin(), name.end(), '-', '_');
  return name;
});

TEST(RecordingFilesTest, EveryExpectationHasARecording) {
  std::vector<std::string> known;
  for (const fs::path& file : recordings()) known.push_back(file.stem());
  for (const auto& entry : fs::directory_iterator(kSource / "tests/recordings")) {
    if (entry.path().extension() == ".expected") {
      EXPECT_THAT(known, testing::Contains(entry.path().stem().string()));
    }
  }
}

}  // namespace
}  // namespace tonewerk

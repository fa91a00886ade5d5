// SPDX-License-Identifier: Apache-2.0
//
// Lets each system call of what writes files fail, one after the other: with a full disk, with a broken one,
// and, for write(), by taking only a part. What was reported as written must be there afterwards, and no
// file may be half.
#include <cstdint>
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <map>
#include <string>

#include "platform/Log.h"
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/files/DurableFile.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/json/JsonBenchfile.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "support/FailingCall.h"
#include "support/InterceptedCalls.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

// The texts of all files below `directory`, by their paths in it.
std::map<std::string, std::string> filesBelow(const std::string& directory) {
  std::map<std::string, std::string> files;
  for (const auto& entry : fs::recursive_directory_iterator(directory)) {
    if (!entry.is_regular_file()) continue;
    std::string text;
    EXPECT_FALSE(readTextFile(entry.path(), text));
    files[entry.path().lexically_relative(directory)] = text;
  }
  return files;
}

class EveryFaultTest : public testing::TestWithParam<Fault> {
 protected:
  // Writes below `directory`. Returns whether it was told that all is written.
  using Writer = std::function<bool(const std::string& directory)>;
  // Looks at what is below `directory`.
  using Judge = std::function<void(const std::string& directory, bool isAcknowledged)>;

  // Runs the writer, each time in a new directory that `prepare` has filled, and lets another call fail each
  // time, until the writer makes fewer calls.
  static void failEachCall(const Writer& prepare, const Writer& write, const Judge& judge) {
    constexpr int kMostCalls = 1'000;
    for (int nth = 1; nth < kMostCalls; ++nth) {
      SCOPED_TRACE("call " + std::to_string(nth));
      const TemporaryDirectory directory;
      if (prepare != nullptr) ASSERT_TRUE(prepare(directory.path()));
      FailingCall failing(nth, GetParam());
      bool isAcknowledged = false;
      const bool isTried = runAnswered(
          FailingCall::writingCalls(), [&failing](const seccomp_data& call) { return failing(call); },
          [&] { isAcknowledged = write(directory.path()); });
      if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
      judge(directory.path(), isAcknowledged);
      // A short write is no failure.
      if (GetParam() == Fault::kShort) EXPECT_TRUE(isAcknowledged);
      if (failing.wasReached()) continue;
      EXPECT_TRUE(isAcknowledged);
      EXPECT_GT(nth, 3);
      return;
    }
    FAIL() << "the writer makes too many calls";
  }
};

// Texts larger than a block are written in several pieces.
const std::string kLarge(600'000, 'x');

TEST_P(EveryFaultTest, AJsonFileIsWholeUnderItsNameOrNotThere) {
  const auto write = [](const std::string& directory) {
    LinuxFileSystem files;
    std::error_code error = files.createDirectories(directory + "/logs/Audio", 0755);
    const auto file = files.createFile(directory + "/logs/Audio", "a.json", error);
    if (file == nullptr) return false;
    for (const char* line : {"[\n", kLarge.c_str(), "\n]\n"}) static_cast<void>(file->write(line));
    return !file->place("a.json");
  };
  failEachCall(nullptr, write, [](const std::string& directory, bool isAcknowledged) {
    const auto files = filesBelow(directory);
    const auto found = files.find("logs/Audio/a.json");
    if (isAcknowledged) EXPECT_NE(found, files.end());
    if (found != files.end()) EXPECT_EQ(found->second, "[\n" + kLarge + "\n]\n");
    EXPECT_EQ(files.size(), found == files.end() ? 0U : 1U);  // no temporary file
  });
}

TEST_P(EveryFaultTest, AReplacedFileIsTheOldOneOrTheNewOne) {
  const auto prepare = [](const std::string& directory) { return !replaceFile(directory, "a.toml", "old"); };
  const auto write = [](const std::string& directory) { return !replaceFile(directory, "a.toml", kLarge); };
  failEachCall(prepare, write, [](const std::string& directory, bool isAcknowledged) {
    const auto files = filesBelow(directory);
    ASSERT_EQ(files.size(), 1U);
    const std::string& text = files.at("a.toml");
    EXPECT_TRUE(text == kLarge || (text == "old" && !isAcknowledged));
  });
}

TEST_P(EveryFaultTest, PreferencesKeepWhatWasWrittenBefore) {
  MemoryLog lines;
  const LogCategory log(lines, "com.orvane.tonewerk", "twrs");
  const auto writeKey = [&log](const std::string& directory, const char* key) {
    TomlPreferenceStore store(directory + "/configuration", directory + "/state", log);
    return !store.write("com.orvane.test", key, std::string(1000, 'v'));
  };
  const auto prepare = [&](const std::string& directory) { return writeKey(directory, "first"); };
  const auto write = [&](const std::string& directory) { return writeKey(directory, "second"); };
  failEachCall(prepare, write, [&log](const std::string& directory, bool isAcknowledged) {
    const TomlPreferenceStore store(directory + "/configuration", directory + "/state", log);
    EXPECT_EQ(store.read("com.orvane.test", "first"), Value(std::string(1000, 'v')));
    if (isAcknowledged) EXPECT_EQ(store.read("com.orvane.test", "second"), Value(std::string(1000, 'v')));
  });
}

TEST_P(EveryFaultTest, ANotificationsStateIsTheOldOneOrTheNewOne) {
  const auto post = [](const std::string& directory, std::uint64_t state) {
    return !NotificationFiles(directory + "/notifications").post("com.orvane.test", state);
  };
  failEachCall([&](const std::string& directory) { return post(directory, 12'345); },
               [&](const std::string& directory) { return post(directory, 67'890); },
               [](const std::string& directory, bool isAcknowledged) {
                 std::error_code error;
                 const auto state =
                     NotificationFiles(directory + "/notifications").state("com.orvane.test", error);
                 EXPECT_TRUE(state == 67'890 || (state == 12'345 && !isAcknowledged)) << state.value_or(0);
               });
}

TEST_P(EveryFaultTest, AnItemOfDiagnosticsIsCompleteOrNotThere) {
  const auto write = [](const std::string& directory) {
    const DiagnosticsDirectory items(directory + "/state");
    return !items.write(DiagnosticKind::kCapture, "item", {{"request.json", "{}"}, {"log", kLarge}});
  };
  failEachCall(nullptr, write, [](const std::string& directory, bool isAcknowledged) {
    const DiagnosticsDirectory items(directory + "/state");
    const auto listed = items.listAll();
    if (isAcknowledged) EXPECT_EQ(listed.size(), 1U);
    for (const auto& item : listed) {
      EXPECT_EQ(items.readFile(item.kind, item.name, "request.json"), "{}");
      EXPECT_EQ(items.readFile(item.kind, item.name, "log"), kLarge);
    }
  });
}

TEST_P(EveryFaultTest, ABenchmarkFileIsWholeUnderItsNameOrNotThere) {
  const auto write = [](const std::string& directory) {
    const ManualClock clock;
    JsonBenchfile benchfile(clock);
    int error = 0;
    const auto writer = benchfile.open(directory + "/a.json", {"test", 1, 77}, error);
    if (writer == nullptr) return false;
    for (int value = 0; value < 2'000; ++value) writer->newValue("value", value, {});
    return !writer->close();
  };
  failEachCall(nullptr, write, [](const std::string& directory, bool isAcknowledged) {
    const auto files = filesBelow(directory);
    if (isAcknowledged) EXPECT_EQ(files.count("a.json"), 1U);
    for (const auto& [name, text] : files) {
      EXPECT_EQ(name, "a.json");
      EXPECT_TRUE(text.ends_with("\n]}\n"));
    }
  });
}

INSTANTIATE_TEST_SUITE_P(Faults, EveryFaultTest,
                         testing::Values(Fault::kNoSpace, Fault::kBroken, Fault::kShort),
                         [](const testing::TestParamInfo<Fault>& info) {
                           return std::string(info.param == Fault::kNoSpace  ? "NoSpace"
                                              : info.param == Fault::kBroken ? "Broken"
                                                                             : "Short");
                         });

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/DiagnosticsStore.h"

#include <atomic>
#include <filesystem>
#include <fstream>
#include <future>
#include <gmock/gmock.h>
#include <optional>
#include <sstream>

#include "platform/Log.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "support/memory/SmallFileSystem.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr auto kGenerous = 30s;

class FixedCollector final : public DiagnosticCollector {
 public:
  FixedCollector(std::string name, Result result) : name_(std::move(name)), result_(std::move(result)) {}
  std::string_view fileName() const override { return name_; }
  Result collect() override { return result_; }

 private:
  const std::string name_;
  const Result result_;
};

// Blocks until release().
class HeldCollector final : public DiagnosticCollector {
 public:
  std::string_view fileName() const override { return "held.txt"; }
  Result collect() override {
    MutexLock lock(mutex_);
    ++entered_;
    changed_.notifyAll();
    while (!isReleased_) changed_.wait(lock);
    return {"late", ""};
  }
  bool waitUntilEntered(int times = 1) {
    const auto end = std::chrono::steady_clock::now() + kGenerous;
    MutexLock lock(mutex_);
    while (entered_ < times && changed_.waitUntil(lock, end)) {
    }
    return entered_ >= times;
  }
  void release() {
    const MutexLock lock(mutex_);
    isReleased_ = true;
    changed_.notifyAll();
  }
  int entered() {
    const MutexLock lock(mutex_);
    return entered_;
  }

 private:
  Mutex mutex_;
  Condition changed_;
  bool isReleased_ GUARDED_BY(mutex_) = false;
  int entered_ GUARDED_BY(mutex_) = 0;
};

struct Answer {
  std::error_code error;
  std::string name;
};

class DiagnosticsStoreTest : public testing::Test {
 protected:
  ~DiagnosticsStoreTest() override {
    held->release();
    store.reset();
  }

  void start(const DiagnosticsStore::Limits& limits = {}) {
    store = std::make_unique<DiagnosticsStore>(directory.path(), collectors, json, preferences, clock, log,
                                               limits);
  }

  // Adds an item; take() waits for its completion.
  std::error_code add(DiagnosticItem item) {
    auto promise = std::make_shared<std::promise<Answer>>();
    std::future<Answer> future = promise->get_future();
    const std::error_code error =
        store->add(std::move(item), [promise](const std::error_code& failed, const std::string& name) {
          promise->set_value({failed, name});
        });
    if (!error) answers.push_back(std::move(future));
    return error;
  }

  Answer take() {
    if (answers.empty()) return {std::make_error_code(std::errc::no_message), ""};
    std::future<Answer> first = std::move(answers.front());
    answers.erase(answers.begin());
    if (first.wait_for(kGenerous) != std::future_status::ready) {
      return {std::make_error_code(std::errc::timed_out), ""};
    }
    return first.get();
  }

  Answer addAndTake(DiagnosticItem item) {
    if (const std::error_code error = add(std::move(item))) return {error, ""};
    return take();
  }

  ValueMap request(DiagnosticKind kind, const std::string& name) {
    std::string problem;
    const std::optional<std::string> text = items.readFile(kind, name, "request.json");
    const std::optional<Value> value = json.parse(text.value_or(""), problem);
    EXPECT_TRUE(value && value->asMap()) << problem;
    return value && value->asMap() ? *value->asMap() : ValueMap();
  }

  std::vector<std::string> names(DiagnosticKind kind) {
    std::vector<std::string> found;
    for (const auto& entry : items.list(kind)) found.push_back(entry.name);
    return found;
  }

  TemporaryDirectory directory;
  DiagnosticsDirectory items{directory.path()};
  MemoryLog lines;
  LogCategory log{lines, "com.orvane.tonewerk", "twrs"};
  ManualClock clock;
  MemoryPreferenceStore preferences;
  NlohmannJsonService json;
  std::shared_ptr<HeldCollector> held = std::make_shared<HeldCollector>();
  std::vector<std::shared_ptr<DiagnosticCollector>> collectors;
  std::vector<std::future<Answer>> answers;
  std::unique_ptr<DiagnosticsStore> store;
};

TEST_F(DiagnosticsStoreTest, LeavesAFolderWithTheRequestAndWhatWasCollected) {
  collectors = {std::make_shared<FixedCollector>("load.txt", DiagnosticCollector::Result{"0.5\n", ""})};
  start();
  const Answer answer = addAndTake({DiagnosticKind::kCapture, "01JD", {{"duration", 0.0}}});
  EXPECT_FALSE(answer.error) << answer.error.message();
  EXPECT_EQ(answer.name, "01JD");
  const ValueMap found = request(DiagnosticKind::kCapture, "01JD");
  EXPECT_EQ(found.number("duration"), 0.0);
  EXPECT_EQ(found.text("requestedAt"), "2025-11-20T10:18:00Z");
  EXPECT_EQ(found.text("collected"), R"(["load.txt"])");
  EXPECT_FALSE(found.contains("problems"));
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "01JD", "load.txt"), "0.5\n");
}

TEST_F(DiagnosticsStoreTest, NamesItemsByTimeAlsoTwoOfTheSameInstant) {
  start();
  EXPECT_EQ(addAndTake({DiagnosticKind::kWhirlcap}).name, "20251120T101800.000Z");
  EXPECT_EQ(addAndTake({DiagnosticKind::kWhirlcap}).name, "20251120T101800.000Z-2");
  EXPECT_EQ(addAndTake({DiagnosticKind::kWhirlcap}).name, "20251120T101800.000Z-3");
  EXPECT_EQ(addAndTake({DiagnosticKind::kIssueDraft}).name, "20251120T101800.000Z");
  clock.advance(0.25);
  EXPECT_EQ(addAndTake({DiagnosticKind::kWhirlcap}).name, "20251120T101800.250Z");
}

TEST_F(DiagnosticsStoreTest, NamesFailedCollectorsAndKeepsTheOtherFiles) {
  collectors = {std::make_shared<FixedCollector>("a.txt", DiagnosticCollector::Result{"", "no such file"}),
                std::make_shared<FixedCollector>("b.txt", DiagnosticCollector::Result{"half", "ended early"}),
                std::make_shared<FixedCollector>("c.txt", DiagnosticCollector::Result{"whole", ""})};
  start();
  const std::string name = addAndTake({DiagnosticKind::kWhirlcap}).name;
  const ValueMap found = request(DiagnosticKind::kWhirlcap, name);
  EXPECT_EQ(found.text("problems"), R"({"a.txt":"no such file","b.txt":"ended early"})");
  EXPECT_EQ(found.text("collected"), R"(["b.txt","c.txt"])");
  EXPECT_EQ(items.readFile(DiagnosticKind::kWhirlcap, name, "a.txt"), std::nullopt);
  EXPECT_EQ(items.readFile(DiagnosticKind::kWhirlcap, name, "b.txt"), "half");
}

TEST_F(DiagnosticsStoreTest, CutsAFileThatIsBeyondTheLimit) {
  collectors = {
      std::make_shared<FixedCollector>("at.txt", DiagnosticCollector::Result{std::string(10, 'x'), ""}),
      std::make_shared<FixedCollector>("over.txt", DiagnosticCollector::Result{std::string(11, 'x'), ""})};
  DiagnosticsStore::Limits limits;
  limits.collectors.bytes = 10;
  start(limits);
  const std::string name = addAndTake({DiagnosticKind::kWhirlcap}).name;
  EXPECT_EQ(request(DiagnosticKind::kWhirlcap, name).text("problems"), R"({"over.txt":"cut at 10 bytes"})");
  EXPECT_THAT(*items.readFile(DiagnosticKind::kWhirlcap, name, "over.txt"), SizeIs(10));
}

TEST_F(DiagnosticsStoreTest, EvidenceIsTextAlsoWhereItIsCut) {
  collectors = {
      std::make_shared<FixedCollector>("a.txt", DiagnosticCollector::Result{"Caf\xE9", "no \xC3"}),
      std::make_shared<FixedCollector>("b.txt", DiagnosticCollector::Result{"nine nine\u00E9", ""})};
  DiagnosticsStore::Limits limits;
  limits.collectors.bytes = 10;
  start(limits);
  const std::string name = addAndTake({DiagnosticKind::kWhirlcap}).name;
  EXPECT_EQ(request(DiagnosticKind::kWhirlcap, name).text("problems"),
            "{\"a.txt\":\"no \uFFFD\",\"b.txt\":\"cut at 10 bytes\"}");
  EXPECT_EQ(items.readFile(DiagnosticKind::kWhirlcap, name, "a.txt"), "Caf\uFFFD");
  EXPECT_EQ(items.readFile(DiagnosticKind::kWhirlcap, name, "b.txt"), "nine nine");
}

TEST_F(DiagnosticsStoreTest, NamesACollectorThatHangsAndDoesNotCallItAgainMeanwhile) {
  collectors = {held, std::make_shared<FixedCollector>("c.txt", DiagnosticCollector::Result{"whole", ""})};
  DiagnosticsStore::Limits limits;
  limits.collectors.time = 50ms;
  start(limits);
  const std::string first = addAndTake({DiagnosticKind::kWhirlcap}).name;
  EXPECT_EQ(request(DiagnosticKind::kWhirlcap, first).text("problems"),
            R"({"held.txt":"timed out after 50 ms"})");
  EXPECT_EQ(items.readFile(DiagnosticKind::kWhirlcap, first, "c.txt"), "whole");
  const std::string second = addAndTake({DiagnosticKind::kWhirlcap}).name;
  EXPECT_EQ(request(DiagnosticKind::kWhirlcap, second).text("problems"),
            R"({"held.txt":"still busy with an earlier item"})");
  EXPECT_EQ(held->entered(), 1);
}

TEST_F(DiagnosticsStoreTest, AddsTheFileThatDescribesTheItem) {
  collectors = {std::make_shared<FixedCollector>("c.txt", DiagnosticCollector::Result{"whole", ""})};
  start();
  DiagnosticItem item{DiagnosticKind::kIssueDraft};
  item.describe = [](Date requestedAt, const DiagnosticEvidence& evidence) {
    return DiagnosticFile{"draft.md", textOf(requestedAt) + " with " + evidence.files.at(0).name};
  };
  const std::string name = addAndTake(std::move(item)).name;
  EXPECT_EQ(items.readFile(DiagnosticKind::kIssueDraft, name, "draft.md"), "2025-11-20T10:18:00Z with c.txt");
}

TEST_F(DiagnosticsStoreTest, RefusesNamesThatAreNotPlain) {
  start();
  for (const std::string name : {"..", ".", ".hidden", "a/b", "/etc", "-x", "a b", "a\nb", "ä"}) {
    EXPECT_EQ(add({DiagnosticKind::kCapture, name}), std::errc::invalid_argument) << name;
  }
  EXPECT_EQ(add({DiagnosticKind::kCapture, std::string("a\0b", 3)}), std::errc::invalid_argument);
  EXPECT_EQ(add({DiagnosticKind::kCapture, std::string(101, 'a')}), std::errc::invalid_argument);
  EXPECT_FALSE(addAndTake({DiagnosticKind::kCapture, std::string(100, 'a')}).error);
}

TEST_F(DiagnosticsStoreTest, RefusesANameThatIsTaken) {
  start();
  EXPECT_FALSE(addAndTake({DiagnosticKind::kCapture, "one", {{"first", true}}}).error);
  EXPECT_EQ(addAndTake({DiagnosticKind::kCapture, "one", {{"first", false}}}).error, std::errc::file_exists);
  EXPECT_TRUE(request(DiagnosticKind::kCapture, "one").boolean("first"));
}

TEST_F(DiagnosticsStoreTest, RefusesItemsBeyondTheQueuesLimitAndLogsItOnce) {
  collectors = {held};
  DiagnosticsStore::Limits limits;
  limits.pendingItems = 2;
  start(limits);
  EXPECT_FALSE(add({DiagnosticKind::kWhirlcap}));
  ASSERT_TRUE(held->waitUntilEntered());  // it is no longer pending
  EXPECT_FALSE(add({DiagnosticKind::kWhirlcap}));
  EXPECT_FALSE(add({DiagnosticKind::kWhirlcap}));
  EXPECT_EQ(add({DiagnosticKind::kWhirlcap}), std::errc::no_buffer_space);
  EXPECT_EQ(add({DiagnosticKind::kWhirlcap}), std::errc::no_buffer_space);
  EXPECT_THAT(lines.textsAt(LogLevel::kError),
              ElementsAre("too many diagnostics at once; requests are refused"));
  held->release();
  for (int count = 0; count < 3; ++count) EXPECT_FALSE(take().error);
  EXPECT_FALSE(addAndTake({DiagnosticKind::kWhirlcap}).error);
  EXPECT_THAT(lines.textsAt(LogLevel::kError), Contains("diagnostics are taken again; refused meanwhile: 2"));
}

TEST_F(DiagnosticsStoreTest, LimitsTheBytesOfPendingItemsButAcceptsOneLargeItem) {
  collectors = {held};
  DiagnosticsStore::Limits limits;
  limits.pendingBytes = 1000;
  start(limits);
  const ValueMap large{{"text", std::string(2000, 'x')}};
  EXPECT_FALSE(add({DiagnosticKind::kWhirlcap}));
  ASSERT_TRUE(held->waitUntilEntered());
  EXPECT_FALSE(add({DiagnosticKind::kWhirlcap, "", large}));
  EXPECT_EQ(add({DiagnosticKind::kWhirlcap, "", large}), std::errc::no_buffer_space);
}

TEST_F(DiagnosticsStoreTest, KeepsAPayloadThatJsonCannotExpress) {
  start();
  const std::string name =
      addAndTake(
          {DiagnosticKind::kWhirlcap, "", {{"bad", std::numeric_limits<double>::quiet_NaN()}, {"good", 1}}})
          .name;
  EXPECT_THAT(*items.readFile(DiagnosticKind::kWhirlcap, name, "request.json"),
              HasSubstr(R"("bad":null,"good":1)"));
}

TEST_F(DiagnosticsStoreTest, WritesPendingItemsAtTheEndWithoutEvidence) {
  collectors = {held};
  start();
  EXPECT_FALSE(add({DiagnosticKind::kCapture, "one"}));
  EXPECT_FALSE(add({DiagnosticKind::kCapture, "two"}));
  ASSERT_TRUE(held->waitUntilEntered());
  store->finish(0ms);
  EXPECT_FALSE(take().error);
  EXPECT_FALSE(take().error);
  EXPECT_EQ(request(DiagnosticKind::kCapture, "one").text("problems"),
            R"({"held.txt":"the daemon was ending"})");
  EXPECT_EQ(request(DiagnosticKind::kCapture, "two").text("problems"),
            R"({"held.txt":"the daemon was ending"})");
  EXPECT_EQ(add({DiagnosticKind::kCapture, "three"}), std::errc::operation_canceled);
}

// Regression: finish() waited for its whole timeout although no items were pending.
TEST_F(DiagnosticsStoreTest, EndsAtOnceWhenNothingIsPending) {
  start();
  EXPECT_FALSE(addAndTake({DiagnosticKind::kCapture, "one"}).error);
  const auto begin = std::chrono::steady_clock::now();
  store->finish(kGenerous);
  EXPECT_LT(std::chrono::steady_clock::now() - begin, kGenerous);
}

// Returns as many bytes as the test sets.
class SizedCollector final : public DiagnosticCollector {
 public:
  explicit SizedCollector(std::size_t count) : bytes(count) {}
  std::string_view fileName() const override { return "sized.txt"; }
  Result collect() override { return {std::string(bytes, 'x'), ""}; }

  std::atomic<std::size_t> bytes;
};

class DiagnosticsBoundsTest : public DiagnosticsStoreTest {
 protected:
  static constexpr std::size_t kKibibyte = 1024;

  DiagnosticsBoundsTest() { collectors = {sized}; }

  void set(std::string_view key, const Value& value) {
    preferences.configure(DiagnosticsStore::kPreferenceDomain, key, value);
  }
  // Sets the times, so that the order does not depend on the file system's clock.
  void setAge(DiagnosticKind kind, const std::string& name, int seconds) {
    std::filesystem::last_write_time(items.pathOf(kind, name), std::filesystem::file_time_type::clock::now() -
                                                                   std::chrono::seconds(seconds));
  }
  std::error_code write(DiagnosticKind kind, const std::string& name) {
    return addAndTake({kind, name}).error;
  }
  std::uint64_t bytesOnDisk() {
    std::uint64_t bytes = 0;
    for (const auto& entry : items.listAll()) bytes += entry.bytes;
    return bytes;
  }

  std::shared_ptr<SizedCollector> sized = std::make_shared<SizedCollector>(300 * kKibibyte);
};

TEST_F(DiagnosticsBoundsTest, RemovesTheOldestItemOfAnyKindWhenThereAreTooManyBytes) {
  set("max_megabytes", 1);
  start();
  ASSERT_FALSE(write(DiagnosticKind::kCapture, "one"));
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "two"));
  ASSERT_FALSE(write(DiagnosticKind::kIssueDraft, "three"));
  setAge(DiagnosticKind::kCapture, "one", 20);
  setAge(DiagnosticKind::kWhirlcap, "two", 30);
  ASSERT_EQ(items.listAll().size(), 3u);
  ASSERT_FALSE(write(DiagnosticKind::kCapture, "four"));
  EXPECT_THAT(names(DiagnosticKind::kCapture), ElementsAre("one", "four"));
  EXPECT_THAT(names(DiagnosticKind::kWhirlcap), IsEmpty());
  EXPECT_THAT(names(DiagnosticKind::kIssueDraft), ElementsAre("three"));
  EXPECT_LE(bytesOnDisk(), 1024 * kKibibyte);
}

TEST_F(DiagnosticsBoundsTest, RemovesTheOldestItemWhenThereAreTooManyItems) {
  set("max_items", 2);
  sized->bytes = 1;
  start();
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "one"));
  setAge(DiagnosticKind::kWhirlcap, "one", 30);
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "two"));
  ASSERT_EQ(items.listAll().size(), 2u);
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "three"));
  EXPECT_THAT(names(DiagnosticKind::kWhirlcap), ElementsAre("two", "three"));
}

TEST_F(DiagnosticsBoundsTest, AnItemOfTheLargestSizeReplacesAllOthers) {
  set("max_megabytes", 1);
  start();
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "one"));
  sized->bytes = (1024 - 4 - 4) * kKibibyte;  // the folder and the request need a block each
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "two"));
  EXPECT_THAT(names(DiagnosticKind::kWhirlcap), ElementsAre("two"));
  EXPECT_EQ(bytesOnDisk(), 1024 * kKibibyte);
}

TEST_F(DiagnosticsBoundsTest, AnItemBeyondTheLimitIsRefusedAndRemovesNoOther) {
  set("max_megabytes", 1);
  start();
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "one"));
  sized->bytes = (1024 - 4 - 4) * kKibibyte + 1;
  EXPECT_EQ(write(DiagnosticKind::kWhirlcap, "two"), std::errc::file_too_large);
  EXPECT_THAT(names(DiagnosticKind::kWhirlcap), ElementsAre("one"));
  EXPECT_THAT(
      lines.textsAt(LogLevel::kError),
      ElementsAre("cannot write " + items.pathOf(DiagnosticKind::kWhirlcap, "two") + ": File too large"));
}

TEST_F(DiagnosticsBoundsTest, WithoutPreferencesTheLimitIsAQuarterOfAGigabyte) {
  sized->bytes = 1;
  start();
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "one"));
  // Fills the limit together with the other files of both items. The file is resized instead of being
  // written.
  const std::size_t rest = (256 * kKibibyte - 8 - 12) * kKibibyte;
  const std::string large = items.pathOf(DiagnosticKind::kWhirlcap, "one") + "/sized.txt";
  std::filesystem::resize_file(large, rest);
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "two"));
  EXPECT_THAT(names(DiagnosticKind::kWhirlcap), ElementsAre("one", "two"));
  ASSERT_FALSE(items.remove(DiagnosticKind::kWhirlcap, "two"));
  std::filesystem::resize_file(large, rest + 1);
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "three"));
  EXPECT_THAT(names(DiagnosticKind::kWhirlcap), ElementsAre("three"));
}

TEST_F(DiagnosticsBoundsTest, InvalidLimitsAreIgnoredAndLoggedOnce) {
  set("max_megabytes", "many");
  set("max_items", 0);
  start();
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "one"));
  ASSERT_FALSE(write(DiagnosticKind::kWhirlcap, "two"));
  EXPECT_EQ(items.listAll().size(), 2u);
  EXPECT_THAT(
      lines.textsAt(LogLevel::kError),
      ElementsAre("preferences of com.orvane.tonewerk.diagnostics that are no number from 1 are left out: "
                  "max_megabytes = many max_items = 0"));
}

TEST_F(DiagnosticsBoundsTest, AFullDiskLeavesNoIncompleteItemsAndTheNextItemWorks) {
  const SmallFileSystem disk(directory.path());  // of one megabyte
  if (!disk.isMounted()) GTEST_SKIP() << "only root can make a file system";
  start();
  sized->bytes = 2048 * kKibibyte;
  EXPECT_EQ(write(DiagnosticKind::kCapture, "large"), std::errc::no_space_on_device);
  EXPECT_TRUE(std::filesystem::is_empty(directory.path("captures")));
  EXPECT_THAT(lines.textsAt(LogLevel::kError),
              ElementsAre("cannot write " + items.pathOf(DiagnosticKind::kCapture, "large") +
                          ": No space left on device"));
  sized->bytes = 500 * kKibibyte;
  EXPECT_FALSE(write(DiagnosticKind::kCapture, "small"));
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "small", "sized.txt")->size(), 500 * kKibibyte);
}

TEST_F(DiagnosticsBoundsTest, ADirectoryThatCannotBeMadeIsAnErrorUntilItCan) {
  const std::string inTheWay = directory.path("captures");
  std::ofstream(inTheWay) << "not a directory";
  start();
  EXPECT_TRUE(write(DiagnosticKind::kCapture, "one"));
  EXPECT_THAT(lines.textsAt(LogLevel::kError), SizeIs(1));
  std::filesystem::remove(inTheWay);
  EXPECT_FALSE(write(DiagnosticKind::kCapture, "two"));
}

TEST_F(DiagnosticsBoundsTest, RemovesLeftoversOfACrashOnRequest) {
  std::filesystem::create_directories(directory.path("captures/.one.new"));
  std::ofstream(directory.path("captures/.one.new/request.json")) << "{";
  start();
  EXPECT_FALSE(write(DiagnosticKind::kWhirlcap, "two"));
  EXPECT_TRUE(std::filesystem::exists(directory.path("captures/.one.new")));
  store->removeLeftovers();
  store->finish(kGenerous);
  EXPECT_TRUE(std::filesystem::is_empty(directory.path("captures")));
  EXPECT_THAT(lines.textsAt(LogLevel::kError), ElementsAre("removed diagnostics that were not complete: 1"));
}

}  // namespace
}  // namespace tonewerk

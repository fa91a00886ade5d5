// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <optional>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::IsEmpty;

class DiagnosticsDirectoryTest : public testing::Test {
 protected:
  void put(const std::string& name, const std::string& text) {
    const fs::path path = root.path(name);
    fs::create_directories(path.parent_path());
    std::ofstream(path) << text;
  }

  // Sets the modification time, in seconds from now. Items with a time in the future are newer than later
  // ones.
  void setAge(const std::string& name, int seconds) {
    fs::last_write_time(root.path(name), fs::file_time_type::clock::now() + std::chrono::seconds(seconds));
  }

  std::vector<std::string> names(const std::vector<DiagnosticsDirectory::Entry>& entries) {
    std::vector<std::string> found;
    for (const auto& entry : entries) found.push_back(entry.name);
    return found;
  }

  TemporaryDirectory root;
  DiagnosticsDirectory items{root.path("state")};
};

TEST_F(DiagnosticsDirectoryTest, IsEmptyWithoutItems) {
  EXPECT_THAT(items.listAll(), IsEmpty());
  EXPECT_EQ(items.sweep(), 0u);
  EXPECT_FALSE(items.contains(DiagnosticKind::kCapture, "a"));
  EXPECT_EQ(items.remove(DiagnosticKind::kCapture, "a"), std::errc::no_such_file_or_directory);
}

TEST_F(DiagnosticsDirectoryTest, MakesReadsListsAndRemovesItems) {
  ASSERT_FALSE(items.write(DiagnosticKind::kWhirlcap, "one", {{"b.txt", "1234"}, {"a.txt", ""}}));
  EXPECT_TRUE(items.contains(DiagnosticKind::kWhirlcap, "one"));
  EXPECT_FALSE(items.contains(DiagnosticKind::kCapture, "one"));
  const auto files = items.filesOf(DiagnosticKind::kWhirlcap, "one");
  ASSERT_EQ(files.size(), 2u);
  EXPECT_EQ(files[0].name, "a.txt");
  EXPECT_EQ(files[1].bytes, 4u);
  EXPECT_EQ(items.readFile(DiagnosticKind::kWhirlcap, "one", "b.txt"), "1234");
  EXPECT_EQ(items.listAll().at(0).bytes, 2u * 4096);  // one block for the folder and one for a file
  EXPECT_FALSE(items.remove(DiagnosticKind::kWhirlcap, "one"));
  EXPECT_FALSE(fs::exists(root.path("state/whirlcaps/one")));
  EXPECT_TRUE(fs::is_empty(root.path("state/whirlcaps")));
}

TEST_F(DiagnosticsDirectoryTest, ListsOldestFirstOverAllKinds) {
  ASSERT_FALSE(items.write(DiagnosticKind::kWhirlcap, "middle", {}));
  ASSERT_FALSE(items.write(DiagnosticKind::kCapture, "new", {}));
  ASSERT_FALSE(items.write(DiagnosticKind::kCapture, "old", {}));
  setAge("state/captures/new", 100);
  setAge("state/captures/old", -100);
  EXPECT_THAT(names(items.listAll()), ElementsAre("old", "middle", "new"));
  EXPECT_THAT(names(items.list(DiagnosticKind::kCapture)), ElementsAre("old", "new"));
}

TEST_F(DiagnosticsDirectoryTest, NamesDoNotLeadOutOfTheDirectory) {
  put("secret/request.json", "secret");
  put("state/captures/item/request.json", "{}");
  fs::create_directory_symlink(root.path("secret"), root.path("state/captures/link"));
  fs::create_symlink(root.path("secret/request.json"), root.path("state/captures/item/link.txt"));
  for (const std::string name : {"..", "../../secret", "link", "/etc", "", ".", "item/../item"}) {
    EXPECT_FALSE(items.contains(DiagnosticKind::kCapture, name)) << name;
    EXPECT_THAT(items.filesOf(DiagnosticKind::kCapture, name), IsEmpty()) << name;
    EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, name, "request.json"), std::nullopt) << name;
    EXPECT_EQ(items.remove(DiagnosticKind::kCapture, name), std::errc::no_such_file_or_directory) << name;
  }
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "item", "link.txt"), std::nullopt);
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "item", "../item/request.json"), std::nullopt);
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "item", "request.json"), "{}");
  EXPECT_THAT(names(items.list(DiagnosticKind::kCapture)), ElementsAre("item"));
  EXPECT_TRUE(fs::exists(root.path("secret/request.json")));
}

TEST_F(DiagnosticsDirectoryTest, RemovesLinksInAnItemButNotTheirTargets) {
  put("secret/request.json", "secret");
  put("state/captures/item/request.json", "{}");
  fs::create_directory_symlink(root.path("secret"), root.path("state/captures/item/link"));
  EXPECT_FALSE(items.remove(DiagnosticKind::kCapture, "item"));
  EXPECT_TRUE(fs::exists(root.path("secret/request.json")));
}

TEST_F(DiagnosticsDirectoryTest, WritesNothingUnderNamesThatAreNotPlain) {
  for (const std::string name : {"..", "../x", "a/b", ".a", "", "a b"}) {
    EXPECT_EQ(items.write(DiagnosticKind::kCapture, name, {}), std::errc::invalid_argument) << name;
    EXPECT_EQ(items.write(DiagnosticKind::kCapture, "item", {{name, ""}}), std::errc::invalid_argument)
        << name;
  }
  EXPECT_FALSE(fs::exists(root.path("state")));
}

TEST_F(DiagnosticsDirectoryTest, ReplacesNothing) {
  ASSERT_FALSE(items.write(DiagnosticKind::kCapture, "item", {{"a", "first"}}));
  EXPECT_EQ(items.write(DiagnosticKind::kCapture, "item", {{"a", "second"}}), std::errc::file_exists);
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "item", "a"), "first");
  put("state/captures/file", "");
  EXPECT_TRUE(items.write(DiagnosticKind::kCapture, "file", {}));
  EXPECT_TRUE(fs::is_regular_file(root.path("state/captures/file")));
}

TEST_F(DiagnosticsDirectoryTest, LeavesNothingAfterAFailure) {
  // Two files of one name: the second cannot be made.
  EXPECT_EQ(items.write(DiagnosticKind::kCapture, "item", {{"a", "1"}, {"a", "2"}}), std::errc::file_exists);
  EXPECT_TRUE(fs::is_empty(root.path("state/captures")));
}

TEST_F(DiagnosticsDirectoryTest, SweepsLeftoversOfACrash) {
  put("state/captures/.item.new/request.json", "{");
  put("state/whirlcaps/.item.old/request.json", "{}");
  put("state/whirlcaps/item/request.json", "{}");
  EXPECT_THAT(names(items.listAll()), ElementsAre("item"));
  EXPECT_EQ(items.sweep(), 2u);
  EXPECT_TRUE(fs::is_empty(root.path("state/captures")));
  EXPECT_TRUE(items.contains(DiagnosticKind::kWhirlcap, "item"));
  // A leftover does not prevent writing the same item again.
  put("state/captures/.next.new/request.json", "{");
  EXPECT_FALSE(items.write(DiagnosticKind::kCapture, "next", {{"request.json", "{}"}}));
  EXPECT_EQ(items.readFile(DiagnosticKind::kCapture, "next", "request.json"), "{}");
}

}  // namespace
}  // namespace tonewerk

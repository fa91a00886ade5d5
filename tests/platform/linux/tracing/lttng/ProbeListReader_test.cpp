// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/ProbeListReader.h"

#include <gmock/gmock.h>

#include "support/memory/MemoryFileSystem.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::SizeIs;
using ::testing::StartsWith;

class ProbeListReaderTest : public testing::Test {
 protected:
  WantedSignposts read(const std::string& json) {
    files_.addFile("/probes.json", json);
    return readWantedSignposts("/probes.json", files_, json_);
  }
  static std::string interval(const std::string& name) {
    return R"({"type": "interval", "name": ")" + name + "\"}";
  }
  static std::string intervals(std::size_t count) {
    std::string list;
    for (std::size_t i = 0; i < count; ++i) list += (i == 0 ? "" : ",") + interval(std::to_string(i));
    return "[" + list + "]";
  }

  MemoryFileSystem files_;
  MemoryJsonService json_;
};

TEST_F(ProbeListReaderTest, FindsTheSignpostsOfAListAndOfASingleProbe) {
  EXPECT_THAT(read("[" + interval("b") + "," + interval("a") + "]").names, ElementsAre("a", "b"));
  const WantedSignposts wanted = read(interval("a"));
  EXPECT_THAT(wanted.names, ElementsAre("a"));
  EXPECT_EQ(wanted.problem, "");
}

TEST_F(ProbeListReaderTest, SaysWhatIsWrongWithTheFile) {
  EXPECT_EQ(readWantedSignposts("/none.json", files_, json_).problem,
            "the probe list /none.json cannot be read: " +
                std::make_error_code(std::errc::no_such_file_or_directory).message());
  EXPECT_THAT(read("[").problem, StartsWith("the probe list /probes.json is no JSON: "));
  EXPECT_EQ(read("7").problem, "the probe list /probes.json holds neither probes nor a probe");
  EXPECT_EQ(read("[]").problem, "the probe list /probes.json names no signpost");
  EXPECT_EQ(read(R"({"name": "a"})").problem, "the probe list /probes.json names no signpost");
}

TEST_F(ProbeListReaderTest, LimitsTheNumberOfSignposts) {
  EXPECT_EQ(read(intervals(WantedSignposts::kMax)).problem, "");
  EXPECT_EQ(read(intervals(WantedSignposts::kMax + 1)).problem,
            "the probe list /probes.json names more than 200 signposts");
}

TEST_F(ProbeListReaderTest, AcceptsNamesThatSignpostsCanHave) {
  const std::string longest(WantedSignposts::kMaxNameBytes, 'x');
  EXPECT_THAT(read(interval(longest)).names, SizeIs(1));
  EXPECT_THAT(read(interval("grün *? \\\\ '")).names, ElementsAre("grün *? \\ '"));
}

TEST_F(ProbeListReaderTest, RefusesNamesThatNoSignpostCanHave) {
  for (const std::string& name :
       {std::string(), std::string(WantedSignposts::kMaxNameBytes + 1, 'x'), std::string("a\\nb"),
        std::string("a\\u0000b"), std::string("a\\u007Fb"), std::string("a\\\"b")}) {
    EXPECT_EQ(read(interval(name)).problem,
              "the probe list /probes.json holds a name that no signpost can have")
        << name;
  }
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/JsonBenchfile.h"

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>
#include <sys/resource.h>

#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

using Json = nlohmann::json;

class JsonBenchfileTest : public testing::Test {
 protected:
  std::unique_ptr<BenchfileWriter> open(const std::string& name = "data.bdj") {
    return benchfile_.open(directory_.path(name), {"TWReporting", 4, 77}, systemError_);
  }
  Json written(const std::string& name = "data.bdj") const {
    std::ifstream file(directory_.path(name));
    return Json::parse(file);
  }

  TemporaryDirectory directory_;
  ManualClock clock_;
  JsonBenchfile benchfile_{clock_};
  int systemError_ = -1;
};

TEST_F(JsonBenchfileTest, TheContextHoldsTheDatasNameAndVersion) {
  const auto writer = open();
  ASSERT_NE(writer, nullptr);
  EXPECT_EQ(systemError_, 0);
  EXPECT_FALSE(writer->close());
  const Json context = written().at("context");
  EXPECT_EQ(context.at("data_name"), "TWReporting");
  EXPECT_EQ(context.at("results_version"), 4);
  EXPECT_EQ(context.at("reporter_id"), 77);
  EXPECT_EQ(context.at("date"), "2025-11-20T10:18:00Z");
  EXPECT_TRUE(context.at("host_name").is_string());
  EXPECT_GE(context.at("num_cpus").get<int>(), 1);
}

TEST_F(JsonBenchfileTest, EachValueIsABenchmarkThatComparisonToolsRead) {
  const auto writer = open();
  writer->newValue("decode", 1.5, {});
  writer->newValue("mix \"loud\"\n", 2.0, {});
  writer->newValue("decode", 0.25, {});
  EXPECT_FALSE(writer->close());
  const Json benchmarks = written().at("benchmarks");
  ASSERT_EQ(benchmarks.size(), 3U);
  EXPECT_EQ(benchmarks[0], Json({{"name", "decode"},
                                 {"run_type", "iteration"},
                                 {"iterations", 1},
                                 {"real_time", 1.5},
                                 {"cpu_time", 1.5},
                                 {"time_unit", "ms"}}));
  EXPECT_EQ(benchmarks[1].at("name"), "mix \"loud\"\n");
  EXPECT_TRUE(benchmarks[1].at("real_time").is_number_float());
  EXPECT_EQ(benchmarks[2].at("real_time"), 0.25);
}

TEST_F(JsonBenchfileTest, AValueHasItsBeginWhereThatIsKnown) {
  const auto writer = open();
  writer->newValue("decode", 1.5, 1'763'633'880.250123);
  writer->newValue("decode", 2.5, {});
  EXPECT_FALSE(writer->close());
  const Json benchmarks = written().at("benchmarks");
  EXPECT_EQ(benchmarks[0].at("begin"), 1'763'633'880.250123);
  EXPECT_FALSE(benchmarks[1].contains("begin"));
}

TEST_F(JsonBenchfileTest, WithoutValuesItIsStillAFile) {
  EXPECT_FALSE(open()->close());
  EXPECT_EQ(written().at("benchmarks"), Json::array());
}

TEST_F(JsonBenchfileTest, WritesMoreThanItHoldsInMemory) {
  const auto writer = open();
  for (int i = 0; i < 10'000; ++i) writer->newValue("decode", i, {});
  EXPECT_FALSE(writer->close());
  const Json benchmarks = written().at("benchmarks");
  ASSERT_EQ(benchmarks.size(), 10'000U);
  for (int i = 0; i < 10'000; ++i) ASSERT_EQ(benchmarks[static_cast<std::size_t>(i)].at("real_time"), i);
}

TEST_F(JsonBenchfileTest, ReplacesTheFileOfAnEarlierRun) {
  std::ofstream(directory_.path("data.bdj")) << std::string(100'000, 'x');
  EXPECT_FALSE(open()->close());
  EXPECT_TRUE(written().contains("context"));
}

TEST_F(JsonBenchfileTest, FollowsNoLink) {
  std::ofstream(directory_.path("precious")) << "text";
  std::filesystem::create_symlink(directory_.path("precious"), directory_.path("data.bdj"));
  EXPECT_FALSE(open()->close());
  std::string text;
  std::ifstream(directory_.path("precious")) >> text;
  EXPECT_EQ(text, "text");
  EXPECT_TRUE(std::filesystem::is_regular_file(std::filesystem::symlink_status(directory_.path("data.bdj"))));
}

TEST_F(JsonBenchfileTest, SaysWhyItCannotBeOpened) {
  EXPECT_EQ(open("nowhere/data.bdj"), nullptr);
  EXPECT_EQ(systemError_, ENOENT);
  std::filesystem::create_directory(directory_.path("data.bdj"));
  EXPECT_EQ(open(), nullptr);
  EXPECT_EQ(systemError_, EEXIST);
}

TEST_F(JsonBenchfileTest, AnAbandonedWriterLeavesNoFile) {
  open()->newValue("decode", 1.5, {});
  EXPECT_FALSE(std::filesystem::exists(directory_.path("data.bdj")));
}

// The limit of the file size simulates a full disk.
TEST_F(JsonBenchfileTest, AFullDiskShowsAtTheEndAndLeavesNoFile) {
  rlimit before{};
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto ignored = std::signal(SIGXFSZ, SIG_IGN);
  const rlimit small{.rlim_cur = 100'000, .rlim_max = before.rlim_max};
  auto writer = open();
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &small), 0);
  for (int i = 0; i < 10'000; ++i) writer->newValue("decode", i, {});
  const std::error_code error = writer->close();
  setrlimit(RLIMIT_FSIZE, &before);
  std::signal(SIGXFSZ, ignored);
  EXPECT_EQ(error, std::errc::file_too_large);
  writer.reset();
  EXPECT_FALSE(std::filesystem::exists(directory_.path("data.bdj")));
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/LinuxProcessInformation.h"

#include <cstring>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

class MadeProc {
 public:
  void write(const std::string& name, const std::string& text) {
    std::filesystem::create_directories(std::filesystem::path(directory_.path(name)).parent_path());
    std::ofstream(directory_.path(name)) << text;
  }
  std::string path() const { return directory_.path(); }
  LinuxProcessInformation information() const { return LinuxProcessInformation(path()); }

 private:
  TemporaryDirectory directory_;
};

TEST(LinuxProcessInformationTest, KnowsThisProcess) {
  const LinuxProcessInformation processes;
  EXPECT_EQ(processes.ownProcessIdentifier(), getpid());
  const auto name = processes.processName(getpid());
  ASSERT_TRUE(name.has_value());
  EXPECT_EQ(*name, "tonewerk_adapte");  // the first 15 bytes of the test program's name
}

TEST(LinuxProcessInformationTest, AProcessThatIsNotThereHasNoName) {
  const LinuxProcessInformation processes;
  EXPECT_EQ(processes.processName(0), std::nullopt);
  EXPECT_EQ(processes.processName(-1), std::nullopt);
  EXPECT_EQ(processes.processName(2'000'000'000), std::nullopt);
}

TEST(LinuxProcessInformationTest, ANameKeepsItsSpaces) {
  MadeProc proc;
  proc.write("7/comm", "Web Content \n");
  EXPECT_EQ(proc.information().processName(7), "Web Content ");
}

// "lecteur-musiqué", cut after 15 bytes, as the kernel does.
TEST(LinuxProcessInformationTest, ANameThatEndsInHalfACharacterEndsInTheReplacementCharacter) {
  MadeProc proc;
  proc.write("7/comm", "lecteur-musiqu\xC3\n");
  EXPECT_EQ(proc.information().processName(7), "lecteur-musiqu\uFFFD");
}

TEST(LinuxProcessInformationTest, TheFootprintIsResidentAndSwappedAnonymousMemory) {
  MadeProc proc;
  proc.write(
      "self/status",
      "Name:\tx\nVmRSS:\t  9000 kB\nRssAnon:\t    1000 kB\nRssFile:\t  8000 kB\nVmSwap:\t      24 kB\n");
  EXPECT_EQ(std::get<std::uint64_t>(proc.information().physicalFootprint()), 1024U * 1024U);
}

TEST(LinuxProcessInformationTest, AFootprintIsReadFromALongStatus) {
  const std::string groups = "Groups:\t" + std::string(9000, '7') + "\n";
  MadeProc proc;
  proc.write("self/status", groups + "RssAnon:\t 8 kB\nVmSwap:\t 2 kB\n" + groups);
  EXPECT_EQ(std::get<std::uint64_t>(proc.information().physicalFootprint()), 10U * 1024U);
}

TEST(LinuxProcessInformationTest, AKernelWithoutSwapHasResidentMemoryOnly) {
  MadeProc proc;
  proc.write("self/status", "Name:\tx\nRssAnon:\t 8 kB\nThreads:\t1\n");
  EXPECT_EQ(std::get<std::uint64_t>(proc.information().physicalFootprint()), 8U * 1024U);
}

TEST(LinuxProcessInformationTest, AFootprintThatCannotBeReadSaysWhy) {
  MadeProc proc;
  EXPECT_EQ(std::get<std::string>(proc.information().physicalFootprint()), "No such file or directory");
  proc.write("self/status", "Name:\tx\n");
  EXPECT_NE(std::get<std::string>(proc.information().physicalFootprint()).find("RssAnon"), std::string::npos);
}

TEST(LinuxProcessInformationTest, TheFootprintGrowsWithTheMemoryInUse) {
  constexpr std::size_t kBytes = std::size_t{64} << 20;
  const LinuxProcessInformation processes;
  const auto before = std::get<std::uint64_t>(processes.physicalFootprint());
  void* memory = mmap(nullptr, kBytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  ASSERT_NE(memory, MAP_FAILED);
  std::memset(memory, 1, kBytes);
  const auto after = std::get<std::uint64_t>(processes.physicalFootprint());
  munmap(memory, kBytes);
  EXPECT_GE(after, before + kBytes / 2);
}

TEST(LinuxProcessInformationTest, WithAClockAFootprintIsReadOnceInTenMilliseconds) {
  ManualClock clock;
  MadeProc proc;
  const LinuxProcessInformation processes(clock, proc.path());
  proc.write("self/status", "RssAnon:\t 8 kB\nVmSwap:\t 0 kB\n");
  EXPECT_EQ(std::get<std::uint64_t>(processes.physicalFootprint()), 8U * 1024U);
  proc.write("self/status", "RssAnon:\t 9 kB\nVmSwap:\t 0 kB\n");
  clock.advance(LinuxProcessInformation::kMaxFootprintAge);
  EXPECT_EQ(std::get<std::uint64_t>(processes.physicalFootprint()), 8U * 1024U);
  clock.advance(std::chrono::nanoseconds(1));
  EXPECT_EQ(std::get<std::uint64_t>(processes.physicalFootprint()), 9U * 1024U);
}

TEST(LinuxProcessInformationTest, AFootprintThatCannotBeReadIsReadAgainAtOnce) {
  ManualClock clock;
  MadeProc proc;
  const LinuxProcessInformation processes(clock, proc.path());
  EXPECT_EQ(std::get<std::string>(processes.physicalFootprint()), "No such file or directory");
  proc.write("self/status", "RssAnon:\t 8 kB\nVmSwap:\t 0 kB\n");
  EXPECT_EQ(std::get<std::uint64_t>(processes.physicalFootprint()), 8U * 1024U);
}

TEST(LinuxProcessInformationTest, ProcessorTimeGrowsWithWork) {
  const LinuxProcessInformation processes;
  const std::int64_t before = processes.processorTimeMicroseconds();
  EXPECT_GE(before, 0);
  while (processes.processorTimeMicroseconds() == before) {
  }
  EXPECT_GT(processes.processorTimeMicroseconds(), before);
}

}  // namespace
}  // namespace tonewerk

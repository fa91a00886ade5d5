// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/PagedOutput.h"

#include <csignal>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <optional>
#include <ostream>
#include <sstream>
#include <string>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedVariable.h"
#include "support/TemporaryDirectory.h"
#include "tools/twctl/TestTerminal.h"
#include "tools/twctl/Tool.h"

namespace tonewerk {
namespace {

using testing::IsEmpty;

// Prints to a terminal of 20 columns and 5 rows, with a pager that writes what it reads into a file.
class PagedOutputTest : public testing::Test {
 protected:
  PagedOutputTest() {
    tool_.outIsTerminal = true;
    tool_.outDescriptor = terminal_.descriptor();
  }

  std::string pagerTo(const std::string& file) { return "sh -c 'cat >" + directory_.path(file) + "'"; }
  // What the pager has read; none when it was not started.
  std::optional<std::string> paged() {
    std::ifstream file(directory_.path("paged"));
    if (!file) return std::nullopt;
    return std::string(std::istreambuf_iterator<char>(file), {});
  }
  void print(const std::string& text) {
    const PagedOutput pages(tool_);
    tool_.out << text << std::flush;
  }

  TemporaryDirectory directory_;
  const ScopedVariable term_{"TERM", "xterm"};
  const ScopedVariable sudo_{"SUDO_UID", nullptr};
  const ScopedVariable others_{"PAGER", nullptr};
  const ScopedVariable ours_{"TONEWERK_PAGER", pagerTo("paged").c_str()};
  TestTerminal terminal_{20, 5};
  std::ostringstream out_;
  std::ostringstream err_;
  NlohmannJsonService json_;
  Tool tool_{.out = out_, .err = err_, .json = json_};
};

const std::string kFour = "1\n2\n3\n4\n";
const std::string kFive = kFour + "5\n";

TEST_F(PagedOutputTest, ShowsWhatFitsTheScreenWithoutAPager) {
  print(kFour);
  EXPECT_EQ(out_.str(), kFour);
  EXPECT_EQ(paged(), std::nullopt);
}

TEST_F(PagedOutputTest, GivesWhatIsLongerThanTheScreenToThePager) {
  print(kFive);
  EXPECT_THAT(out_.str(), IsEmpty());
  EXPECT_EQ(paged(), kFive);
}

TEST_F(PagedOutputTest, CountsTheLinesThatALongLineTakes) {
  print(std::string(81, 'x') + "\n");
  EXPECT_EQ(paged(), std::string(81, 'x') + "\n");
}

TEST_F(PagedOutputTest, HasErrorsBehindTheOutput) {
  {
    const PagedOutput pages(tool_);
    tool_.out << kFive;
    EXPECT_EQ(tool_.fail(kRefused, "the disk is gone"), kRefused);
    EXPECT_THAT(err_.str(), IsEmpty());
  }
  EXPECT_EQ(err_.str(), "twctl: the disk is gone\n");
  EXPECT_EQ(paged(), kFive);
}

TEST_F(PagedOutputTest, UsesThePagerOfOtherProgramsWhereThereIsNoneForThisOne) {
  const ScopedVariable unset("TONEWERK_PAGER", nullptr);
  const ScopedVariable other("PAGER", pagerTo("paged").c_str());
  print(kFive);
  EXPECT_EQ(paged(), kFive);
}

TEST_F(PagedOutputTest, PrintsWithoutAPagerWhereNoneIsWanted) {
  for (const char* none : {"", " ", "cat"}) {
    const ScopedVariable pager("TONEWERK_PAGER", none);
    print(kFive);
  }
  EXPECT_EQ(out_.str(), kFive + kFive + kFive);
}

TEST_F(PagedOutputTest, PrintsEverythingWhenThereIsNoSuchPager) {
  const ScopedVariable pager("TONEWERK_PAGER", directory_.path("nothing").c_str());
  std::string much;
  for (int line = 0; line < 10'000; ++line) much += std::to_string(line) + "\n";
  print(much);
  EXPECT_EQ(out_.str(), much);
  EXPECT_TRUE(out_.good());
}

TEST_F(PagedOutputTest, AReaderWhoLeavesEarlyIsNoErrorAndEndsTheOutput) {
  const ScopedVariable pager("TONEWERK_PAGER",
                             ("sh -c 'head -c 1 >" + directory_.path("paged") + "'").c_str());
  {
    const PagedOutput pages(tool_);
    // Ends because a pipe holds only so much.
    while (tool_.out) tool_.out << "a line\n" << std::flush;
  }
  EXPECT_TRUE(tool_.out.good());
  EXPECT_EQ(paged(), "a");
  struct sigaction action {};
  sigaction(SIGPIPE, nullptr, &action);
  EXPECT_EQ(action.sa_handler, SIG_DFL);
}

TEST_F(PagedOutputTest, IsForTerminalsAndPeople) {
  tool_.withoutPager = true;
  print(kFive);
  tool_.withoutPager = false;
  tool_.asJson = true;
  print(kFive);
  tool_.asJson = false;
  {
    const ScopedVariable dumb("TERM", "dumb");
    print(kFive);
  }
  tool_.outIsTerminal = false;
  print(kFive);
  EXPECT_EQ(out_.str(), kFive + kFive + kFive + kFive);
  EXPECT_EQ(paged(), std::nullopt);
}

TEST_F(PagedOutputTest, TellsLessHowToBehaveUnlessTheUserHas) {
  const ScopedVariable pager(
      "TONEWERK_PAGER", ("sh -c 'echo $LESS >" + directory_.path("paged") + "; cat >/dev/null'").c_str());
  {
    const ScopedVariable unset("LESS", nullptr);
    print(kFive);
    EXPECT_EQ(paged(), "FRSX\n");
  }
  const ScopedVariable own("LESS", "-i");
  print(kFive);
  EXPECT_EQ(paged(), "-i\n");
}

// A rule that lets a user run twctl as root must not give a shell, which less and other pagers can start.
TEST_F(PagedOutputTest, StartsNoPagerOfTheUsersForAnotherUser) {
  const ScopedVariable sudo("SUDO_UID", "1000");
  const ScopedVariable path("PATH", directory_.path("programs").c_str());  // without less
  print(kFive);
  EXPECT_EQ(out_.str(), kFive);
  EXPECT_EQ(paged(), std::nullopt);
}

}  // namespace
}  // namespace tonewerk

// SPDX-License-Identifier: Apache-2.0
// Tests which symbols the libraries export.
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <regex>
#include <set>
#include <sstream>

#include "client/CommandOutput.h"

namespace tonewerk {
namespace {

std::set<std::string> functionsOfTheHeaders() {
  const std::regex declaration("TWR_API [^;]*?(twr_[a-z_]+)\\(");
  std::set<std::string> names;
  for (const std::string header : {"reporting.h", "reporting_audio.h"}) {
    std::ifstream file(TONEWERK_INCLUDE_DIRECTORY "/tonewerk/" + header);
    const std::string text{std::istreambuf_iterator<char>(file), {}};
    for (std::sregex_iterator at(text.begin(), text.end(), declaration); at != std::sregex_iterator(); ++at)
      names.insert((*at)[1]);
  }
  return names;
}

// The names of the defined symbols, from the third column, without their versions.
std::set<std::string> symbolsOf(const std::string& library, const std::string& options) {
  std::istringstream lines(outputOfCommand(TONEWERK_NM " --defined-only " + options + " " + library));
  std::set<std::string> names;
  std::string line;
  while (std::getline(lines, line)) {
    std::istringstream words(line);
    std::string address;
    std::string kind;
    std::string name;
    if (words >> address >> kind >> name) names.insert(name);
  }
  return names;
}

TEST(LibrarySymbolsTest, AreTheHeadersFunctionsUnderOneVersion) {
  std::set<std::string> expected = {"TWREPORTING_0"};
  for (const std::string& name : functionsOfTheHeaders()) expected.insert(name + "@@TWREPORTING_0");
  EXPECT_GT(expected.size(), 50U);
  EXPECT_EQ(symbolsOf(TONEWERK_REPORTING_LIBRARY, "-D"), expected);
}

TEST(LibrarySymbolsTest, AreTheHeadersFunctionsInTheStaticLibraryToo) {
  EXPECT_EQ(symbolsOf(TONEWERK_REPORTING_ARCHIVE, "-g"), functionsOfTheHeaders());
}

}  // namespace
}  // namespace tonewerk

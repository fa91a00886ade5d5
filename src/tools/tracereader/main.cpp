// SPDX-License-Identifier: Apache-2.0
//
// tw-trace-reader writes the intervals of a trace's signposts as text. The daemon runs it as a separate
// process, because a damaged trace can make its reader hang or crash.
//
//   name decode          the next name, counted from 0; "\\" and "\n" stand for a backslash and a newline
//   0 1523411 20411      an interval with name 0: its duration, and its end since that of the one before,
//                        both in nanoseconds; the first one's end is since 1970
//   end                  the last line
//
// If the trace cannot be used, it writes "problem TEXT" instead and exits with status 1. Wrong usage gives
// status 2.

#include <cstdint>
#include <cstdio>
#include <string>

#include "tools/tracereader/CtfTrace.h"
#include "tools/tracereader/SignpostPairs.h"

namespace {

std::string escaped(const std::string& name) {
  std::string text;
  for (const char c : name) {
    if (c == '\\') {
      text += "\\\\";
    } else if (c == '\n') {
      text += "\\n";
    } else {
      text += c;
    }
  }
  return text;
}

bool print(const tonewerk::SignpostPairs& pairs) {
  for (const std::string& name : pairs.names()) std::printf("name %s\n", escaped(name).c_str());
  std::int64_t previousEnd = 0;
  for (const auto& interval : pairs.intervals()) {
    std::printf("%zu %llu %lld\n", interval.name, static_cast<unsigned long long>(interval.nanoseconds),
                static_cast<long long>(interval.end - previousEnd));
    previousEnd = interval.end;
  }
  std::printf("end\n");
  return std::fflush(stdout) == 0 && std::ferror(stdout) == 0;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::fputs("usage: tw-trace-reader DIRECTORY\n", stderr);
    return 2;
  }
  tonewerk::SignpostPairs pairs;
  const std::string problem = tonewerk::readCtfTrace(
      argv[1], [&pairs](const tonewerk::SignpostEvent& event) { return pairs.add(event); });
  if (!problem.empty()) {
    std::printf("problem %s\n", escaped(problem).c_str());
    return 1;
  }
  return print(pairs) ? 0 : 1;
}

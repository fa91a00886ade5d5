// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as the cycles of a glitch, which a client has sent. Whatever they are, the picture of them
// fits its width and does not control the terminal, and the trace of them is JSON in which no slices overlap.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "FuzzInput.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "tools/twctl/glitches/GlitchPicture.h"
#include "tools/twctl/sessions/ChromeTrace.h"
#include "tools/twctl/sessions/GlitchCycles.h"
#include "values/PrintableText.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

void draw(const std::vector<GlitchCycle>& cycles) {
  for (const std::size_t width : {std::size_t{0}, std::size_t{60}, std::size_t{100}}) {
    for (const bool isUnicode : {false, true}) {
      const GlitchPicture picture({.width = width, .isUnicode = isUnicode, .isColoured = false});
      std::istringstream lines(picture.draw(cycles));
      for (std::string line; std::getline(lines, line);) {
        expect(isPrintable(line) && utf8Characters(line) <= std::max(width, GlitchPicture::kNarrowest));
      }
    }
  }
}

void trace(const std::vector<GlitchCycle>& cycles) {
  constexpr double kBegin = 1'763'633'880.0;
  const StoredSession session{.id = 1, .startedAt = kBegin, .endedAt = kBegin + 1.0};
  SessionRecords records;
  for (std::int64_t event = 1; event <= 2; ++event) {
    GlitchVerdict verdict;
    verdict.event = event;
    verdict.at = kBegin + static_cast<double>(event) / 100.0;
    verdict.cause = "late";
    records.issues.push_back({.event = event, .at = verdict.at, .kind = "overload", .verdict = verdict});
  }
  const auto json = nlohmann::json::parse(chromeTrace(session, records, {{1, cycles}, {2, cycles}}));
  std::map<std::pair<std::int64_t, std::int64_t>, std::int64_t> busyUntil;
  for (const auto& event : json.at("traceEvents")) {
    if (event.at("ph") != "X") continue;
    const std::pair<std::int64_t, std::int64_t> thread(event.at("pid"), event.at("tid"));
    const std::int64_t at = event.at("ts");
    expect(at >= 0 && at >= busyUntil[thread]);
    busyUntil[thread] = at + event.at("dur").get<std::int64_t>();
  }
}

void read(FuzzInput input) {
  static const NlohmannJsonService json;
  const std::vector<GlitchCycle> cycles = GlitchCycles::read(input.rest(), json);
  expect(cycles.size() <= GlitchCycles::kMostCycles);
  draw(cycles);
  trace(cycles);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({data, size});
  return 0;
}

// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as the benchmark data file of a performance trace. Whatever it is, the intervals lie within
// their limits, and the trace of a session with them is JSON in which each begin has its end.
#include <cstddef>
#include <cstdint>
#include <limits>
#include <nlohmann/json.hpp>
#include <optional>
#include <set>
#include <sstream>
#include <string>

#include "FuzzInput.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "tools/twctl/sessions/ChromeTrace.h"
#include "tools/twctl/sessions/SignpostFile.h"

namespace tonewerk {
namespace {

void read(FuzzInput input) {
  static const NlohmannJsonService json;
  constexpr double kBegin = 1'763'633'880.0;
  const SignpostFilter filter{.since = kBegin, .until = std::numeric_limits<double>::infinity()};
  std::istringstream file{std::string(input.rest())};
  std::string problem;
  const std::optional<Signposts> signposts = readSignposts(file, filter, json, problem);
  expect(signposts.has_value() == problem.empty());
  if (!signposts) return;
  const StoredSession session{.id = 1, .startedAt = kBegin};
  const auto trace = nlohmann::json::parse(chromeTrace(session, {}, {}, signposts->intervals));
  std::set<std::int64_t> open;
  std::int64_t last = 0;
  for (const auto& event : trace.at("traceEvents")) {
    expect(event.at("ts") >= last);
    last = event.at("ts");
    if (event.at("ph") == "b") expect(open.insert(event.at("id").get<std::int64_t>()).second);
    if (event.at("ph") == "e") expect(open.erase(event.at("id").get<std::int64_t>()) == 1);
  }
  expect(open.empty());
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({data, size});
  return 0;
}

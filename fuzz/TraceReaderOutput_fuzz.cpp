// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a probe list, in a text whose length is the first two bytes, and as the output of
// tw-trace-reader.
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "FuzzInput.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/tracing/lttng/ProbeListReader.h"
#include "platform/linux/tracing/lttng/TraceIntervals.h"
#include "support/memory/MemoryFileSystem.h"

namespace tonewerk {
namespace {

void readProbeList(std::string_view text) {
  MemoryFileSystem files;
  files.addFile("/probes.json", std::string(text));
  const WantedSignposts wanted = readWantedSignposts("/probes.json", files, NlohmannJsonService());
  if (!wanted.problem.empty()) return;
  expect(!wanted.names.empty() && wanted.names.size() <= WantedSignposts::kMax);
  for (const std::string& name : wanted.names) {
    expect(!name.empty() && name.size() <= WantedSignposts::kMaxNameBytes);
    expect(name.find_first_of("\"\n") == std::string::npos);
  }
}

void readOutput(std::string_view text) {
  std::string problem;
  const std::optional<TraceIntervals> intervals = parseTraceIntervals(text, problem);
  if (!intervals) return;
  expect(problem.empty() && text.ends_with("end\n"));
  std::size_t count = 0;
  for (const auto& [name, durations] : *intervals) count += durations.size();
  expect(count < text.size());
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::FuzzInput input(data, size);
  tonewerk::readProbeList(input.longText());
  tonewerk::readOutput(input.rest());
  return 0;
}

// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a recording of requests. Requests that it accepts are requests that the daemon accepts,
// whenever they are played. Written anew, they are the same requests.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "FuzzInput.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "protocol/Requests.h"
#include "tools/recording/Recording.h"
#include "tools/recording/RecordingWriter.h"
#include "values/Nesting.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr double kNow = 1'763'633'880.0;
// No recording takes longer; its times are then those of the years that a recording may be from.
constexpr double kLongest = 1e9;

std::optional<Recording> recordingOf(const std::string& text, std::string& problem) {
  const NlohmannJsonService json;
  std::istringstream lines(text);
  return Recording::read(lines, requests::all(), json, problem);
}

// Whether a client could have sent the arguments.
bool fitIntoFrame(const Arguments& arguments) {
  return std::all_of(arguments.begin(), arguments.end(), [](const Argument& argument) {
    return !argument || nestsWithin(*argument, kMaxFrameDepth);
  });
}

void writeAnew(const Recording& recording) {
  const NlohmannJsonService json;
  std::ostringstream out;
  std::vector<Arguments> written;
  RecordingWriter writer(out, json, {});
  for (const RecordedStep& step : recording.steps()) {
    if (step.at > kLongest) return;
    if (step.kind == RecordedStep::Kind::kDisconnect) writer.disconnect(kNow + step.at, step.client);
    if (step.kind != RecordedStep::Kind::kCall) continue;
    written.push_back(step.parametersAt(kNow));
    if (!fitIntoFrame(written.back())) return;
    writer.call(kNow + step.at, {step.client, 1001, "player"}, step.method, written.back());
  }
  expect(writer.finish());
  std::string problem;
  const std::optional<Recording> again = recordingOf(out.str(), problem);
  expect(again && again->requests() == recording.requests());
  auto next = written.begin();
  for (const RecordedStep& step : again->steps()) {
    if (step.kind == RecordedStep::Kind::kCall) expect(step.parametersAt(0.0) == *next++);
  }
}

void read(const std::string& text) {
  std::string problem;
  const std::optional<Recording> recording = recordingOf(text, problem);
  expect(recording.has_value() == problem.empty());
  if (!recording) return expect(problem.starts_with("line "));
  double last = 0.0;
  for (const RecordedStep& step : recording->steps()) {
    expect(step.at >= last && isUtf8(step.method));
    last = step.at;
    if (step.kind != RecordedStep::Kind::kCall) continue;
    const auto method = requests::all().find(step.method);
    expect(method.has_value());
    expect(!problemWith(requests::all().methods[*method], step.parametersAt(kNow)));
  }
  writeAnew(*recording);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}

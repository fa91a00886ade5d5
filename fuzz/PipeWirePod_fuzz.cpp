// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a pod from PipeWire: a report of the profiler, a node's properties or its format. The
// pod's own size is made to match the input's, as PipeWire checks it; everything inside is as the input says.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <spa/pod/pod.h>

#include "FuzzInput.h"
#include "bridges/pipewire/graph/PipeWireParams.h"
#include "bridges/pipewire/graph/PipeWireProfile.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

void read(const spa_pod& pod) {
  for (const ProfiledCycle& cycle : cyclesOf(pod)) {
    expect(cycle.period.count() >= 0 && cycle.frames > 0);
    expect(!cycle.processing || (cycle.begin && cycle.processing->count() >= 0));
  }
  const std::optional<double> shown = volumeOf(pod).shown();
  expect(!shown || (*shown >= 0.0 && *shown <= 1.0));
  if (const auto format = formatOf(pod)) expect(isUtf8(format->text()) && format->rateHertz > 0);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < sizeof(spa_pod)) return 0;
  // A block of exactly this size, so that the sanitizer sees each read behind the pod.
  const std::unique_ptr<std::uint8_t[]> bytes(new std::uint8_t[size]);
  std::memcpy(bytes.get(), data, size);
  auto* pod = reinterpret_cast<spa_pod*>(bytes.get());
  pod->size = static_cast<std::uint32_t>(size - sizeof(spa_pod));
  tonewerk::read(*pod);
  return 0;
}

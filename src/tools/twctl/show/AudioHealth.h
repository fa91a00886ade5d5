// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "platform/Chanmeter.h"

namespace tonewerk {

// How an audio device did in the last interval.
struct DeviceHealth {
  std::string device;
  bool isInput = false;
  std::optional<double> load;         // mean processing time, a share of the period; none when nothing ran
  std::optional<double> worst;        // the longest processing time was less than this share of the period
  std::optional<std::int64_t> xruns;  // since its counting began
};

// How a node of the audio graph did.
struct NodeHealth {
  std::string node;
  std::optional<double> busy;            // mean share of the period that it took in the last second
  std::optional<double> worst;           // the largest share of the last minute
  std::optional<std::int64_t> glitches;  // that it caused since the counting began
  std::optional<std::int64_t> process;   // its process identifier
};

struct AudioHealth {
  std::vector<DeviceHealth> devices;  // by name
  std::vector<NodeHealth> nodes;      // by name
};

// Reads the health of the audio from driver channels: "Processing Time" and "Xruns" of devices in the groups
// Tx and Rx, and the group Nodes. docs/driver-channels.md and docs/pipewire-bridge.md describe them.
class AudioHealthReader {
 public:
  // The largest numbers that are shown; publishers are other programs.
  static constexpr std::size_t kMaxDevices = 32;
  static constexpr std::size_t kMaxNodes = 256;

  // `chanmeter` outlives it.
  explicit AudioHealthReader(Chanmeter& chanmeter) : chanmeter_(chanmeter) {}

  // The processing times are those since the previous call, and unknown at the first.
  AudioHealth read();

 private:
  Chanmeter& chanmeter_;
  Chanmeter::Samples earlier_;
};

}  // namespace tonewerk
